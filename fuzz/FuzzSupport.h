// Not part of the interface: start-up shared by the fuzz targets.
#pragma once

#include <string>

namespace ovrafuzz {

// Points the library's data folders at a private temporary folder, starts
// the library once and keeps it running for the whole fuzzing session.
void StartLibrary();

// A private temporary folder of this process, created on first use.
const std::string& ScratchFolder();

}  // namespace ovrafuzz
