// ovrametadata: the umbrella header; includes every public header.
#pragma once

#include <ovrametadata/Common.h>
#include <ovrametadata/Initialize.h>
#include <ovrametadata/Definitions.h>
#include <ovrametadata/Paths.h>
#include <ovrametadata/Values.h>
#include <ovrametadata/ValueEditing.h>
#include <ovrametadata/Format.h>
#include <ovrametadata/Providers.h>
#include <ovrametadata/MetadataUtils.h>
#include <ovrametadata/Views.h>
#include <ovrametadata/Extensions.h>
#include <ovrametadata/MRU.h>
