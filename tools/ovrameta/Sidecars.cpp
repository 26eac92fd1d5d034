#include "Sidecars.h"

#include <algorithm>
#include <cctype>
#include <filesystem>
#include <fstream>
#include <set>

namespace ovrameta {

namespace {

std::string LowerExtension(const std::string& file) {
  std::string extension = std::filesystem::path(file).extension().string();
  std::transform(extension.begin(), extension.end(), extension.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  return extension;
}

bool Exists(const std::string& path) {
  std::error_code error;
  return std::filesystem::is_regular_file(path, error);
}

}  // namespace

bool IsCameraRaw(const std::string& file) {
  // DNG is left out: it is made to carry its XMP inside.
  static const std::set<std::string> kRaw = {".3fr", ".arw", ".cr2", ".cr3", ".crw", ".dcr", ".erf", ".iiq",
                                             ".k25", ".kdc", ".mef", ".mos", ".mrw", ".nef", ".nrw", ".orf",
                                             ".pef", ".raf", ".raw", ".rw2", ".rwl", ".sr2", ".srf", ".srw",
                                             ".x3f"};
  return kRaw.count(LowerExtension(file)) != 0;
}

std::string SidecarOf(const std::string& file, SidecarName name) {
  const std::string full = file + ".xmp";
  const std::string base = std::filesystem::path(file).replace_extension(".xmp").string();
  if (Exists(full)) return full;
  if (Exists(base)) return base;
  return name == SidecarName::kFull ? full : base;
}

std::string MetadataFile(const std::string& file, const SidecarOptions& options, bool writing) {
  if (LowerExtension(file) == ".xmp") return file;
  if (options.always) return SidecarOf(file, options.name);
  if (!IsCameraRaw(file)) return file;
  const std::string sidecar = SidecarOf(file, options.name);
  return writing || Exists(sidecar) ? sidecar : file;
}

bool CreateSidecar(const std::string& path) {
  std::ofstream out(path, std::ios::binary | std::ios::trunc);
  out << "<x:xmpmeta xmlns:x=\"adobe:ns:meta/\"><rdf:RDF "
         "xmlns:rdf=\"http://www.w3.org/1999/02/22-rdf-syntax-ns#\"/></x:xmpmeta>\n";
  return static_cast<bool>(out.flush());
}

}  // namespace ovrameta
