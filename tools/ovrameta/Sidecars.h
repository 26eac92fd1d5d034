// Private to the ovrameta tool (not part of the library's interface): the
// XMP sidecar beside a media file.
#pragma once

#include <string>

namespace ovrameta {

enum class SidecarName {
  kBase,  // "photo.xmp": what most raw converters write and read
  kFull,  // "photo.cr3.xmp": one sidecar per file even where names share a stem
};

struct SidecarOptions {
  bool always = false;  // --sidecar: every file through its sidecar
  SidecarName name = SidecarName::kBase;
};

// Camera raw files are never written: their sidecar takes the edits.
bool IsCameraRaw(const std::string& file);

// The sidecar of a media file: the one that exists ("photo.cr3.xmp" first,
// since it cannot belong to another file), else the one name names.
std::string SidecarOf(const std::string& file, SidecarName name);

// Where the metadata of file is read from and written to: its sidecar
// with --sidecar, and for camera raw files when the sidecar exists or when
// writing; else the file itself. A name that is a sidecar stays as it is.
std::string MetadataFile(const std::string& file, const SidecarOptions& options, bool writing);

// Makes an empty sidecar so that the library can write into it. False when
// it cannot be made.
bool CreateSidecar(const std::string& path);

}  // namespace ovrameta
