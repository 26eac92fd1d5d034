// Helpers of the toolkit-layer tests.
#pragma once

#include <string>

#include <ovraxmp/XMPToolkit.h>

#include "TestSupport.h"

namespace xmptest {

inline const char kTestNS[] = "http://ovra.test/ns/xmp/";

// Registers the test namespace (prefix "ovt") once.
inline void RegisterTestNamespace() {
  ovraxmp::XMPMeta::RegisterNamespace(kTestNS, "ovt", nullptr);
}

inline std::string RealWorldPacket() {
  return ovratest::ReadFile(ovratest::DataDir() / "xmp" / "realworld.xmp");
}

inline ovraxmp::XMPMeta Parse(const std::string& text) {
  ovraxmp::XMPMeta meta;
  meta.ParseFromBuffer(text);
  return meta;
}

inline std::string Serialize(const ovraxmp::XMPMeta& meta) {
  std::string out;
  meta.SerializeToBuffer(&out, ovraxmp::kXMP_OmitPacketWrapper);
  return out;
}

inline std::string Get(const ovraxmp::XMPMeta& meta, const std::string& ns, const std::string& path) {
  std::string value;
  if (!meta.GetProperty(ns, path, &value)) return "<absent>";
  return value;
}

}  // namespace xmptest
