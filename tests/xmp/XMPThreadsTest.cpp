// The layer's own state under threads that work on different packets.
#include <atomic>
#include <string>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

#include "XMPTestUtil.h"

using namespace ovraxmp;

TEST(XMPThreads, EightThreadsOnTheirOwnPacketsAndOneSharedHandle) {
  xmptest::RegisterTestNamespace();
  const std::string packet = xmptest::RealWorldPacket();
  XMPMeta shared = xmptest::Parse(packet);
  const XMPMetaRef sharedRef = shared.GetInternalRef();
  std::atomic<int> failures{0};
  std::vector<std::thread> threads;
  for (int t = 0; t < 8; ++t) {
    threads.emplace_back([&, t] {
      try {
        const std::string ns = "http://ovra.test/ns/thread" + std::to_string(t) + "/";
        XMPMeta::RegisterNamespace(ns, "ovthr" + std::to_string(t), nullptr);
        for (int round = 0; round < 40; ++round) {
          XMPMetaRefAddRef(sharedRef);  // reference counts move under contention
          XMPMeta own = xmptest::Parse(packet);
          own.SetProperty(ns, "Round", std::to_string(round));
          own.SetMultiValued(ns, "Round");
          XMPMeta aggregate;
          XMPUtils::MultiFileCollect(&aggregate, own);
          XMPUtils::MultiFileCollect(&aggregate, xmptest::Parse(packet));
          XMPMeta member = own.Clone();
          XMPUtils::MultiFileDistribute(aggregate, &member);
          std::string value, text;
          if (xmptest::Get(own, ns, "Round") != std::to_string(round)) ++failures;
          if (!aggregate.IsMultiValued(ns, "Round") || !own.IsMultiValued(ns, "Round")) ++failures;
          text = XMPUtils::CatenateArrayItems(own, kXMP_NS_DC, "subject", "; ", "\"", 0);
          XMPUtils::SeparateArrayItems(&member, kXMP_NS_DC, "subject", 0, text);
          if (member.CountArrayItems(kXMP_NS_DC, "subject") != 3) ++failures;
          text = member.SerializeToBuffer();
          XMPMetaRefRelease(sharedRef);
        }
      } catch (const std::exception&) {
        ++failures;
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(failures.load(), 0);
  EXPECT_EQ(XMPMetaRefGetCount(sharedRef), 1);
}
