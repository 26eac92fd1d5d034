// Helpers of the toolkit-layer tests.
#pragma once

#include <cstdint>
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
  out = meta.SerializeToBuffer(ovraxmp::kXMP_OmitPacketWrapper);
  return out;
}

// The id of the XMP_Error that call raises, 0 when it raises none.
template <typename Call>
std::int32_t ErrorIdOf(Call&& call) {
  try {
    call();
  } catch (const ovraxmp::XMP_Error& e) {
    return e.GetID();
  }
  return 0;
}

inline std::string Get(const ovraxmp::XMPMeta& meta, const std::string& ns, const std::string& path) {
  const auto node = meta.GetProperty(ns, path);
  return node ? node->value : "<absent>";
}

inline ovraxmp::XMP_OptionBits OptionsOf(const ovraxmp::XMPMeta& meta, const std::string& ns, const std::string& path) {
  return meta.GetProperty(ns, path).value_or(ovraxmp::XMP_Node()).options;
}

}  // namespace xmptest
