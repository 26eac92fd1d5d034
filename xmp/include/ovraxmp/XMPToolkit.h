// ovraxmp: the XMP toolkit layer, everything at once.
#pragma once

#include <ovraxmp/XMPConsts.h>
#include <ovraxmp/XMPError.h>
#include <ovraxmp/XMPDocOps.h>
#include <ovraxmp/XMPFiles.h>
#include <ovraxmp/XMPIterator.h>
#include <ovraxmp/XMPMeta.h>
#include <ovraxmp/XMPUtils.h>
