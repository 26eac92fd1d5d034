// Eight threads open, read and write their own files through providers
// while a ninth reports errors, registers namespaces and queries the format
// cache. Runs for OVRA_STRESS_SECONDS (default 10); scripts/stress runs it
// under ThreadSanitizer. Nothing may be lost: every write is read back by a
// fresh provider, every report is recorded and delivered once.
#include <atomic>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include <boost/make_shared.hpp>
#include <gtest/gtest.h>

#include <ovrametadata/MetadataUtils.h>

#include "ProviderTestSupport.h"

namespace {

namespace fs = std::filesystem;
using namespace ovrametadata;
using ovratest::MediaKind;

double StressSeconds() {
  const char* text = std::getenv("OVRA_STRESS_SECONDS");
  const double seconds = text ? std::atof(text) : 10.0;
  return seconds > 0 ? seconds : 10.0;
}

TEST(Stress, EightWritersAndAReporterLoseNothing) {
  constexpr int kWriters = 8;
  const auto deadline = std::chrono::steady_clock::now() + std::chrono::duration<double>(StressSeconds());
  ovratest::TempDir dir;
  const MediaKind kinds[] = {MediaKind::JPEG, MediaKind::MP4, MediaKind::WAV};
  // The reporter queries files of its own: a file that another thread is
  // replacing may briefly be unreadable to a third.
  std::vector<std::vector<fs::path>> files(kWriters + 1);
  for (int t = 0; t <= kWriters; ++t)
    for (int k = 0; k < 3; ++k)
      files[t].push_back(ovratest::MakeMediaFile(dir.path(), "t" + std::to_string(t) + "_" + std::to_string(k),
                                                 kinds[k], "<pt:Title>start</pt:Title>"));

  auto delivered = std::make_shared<std::atomic<long>>(0);
  auto callback = boost::make_shared<ErrorCallback>([delivered](const UTF16String&) { ++*delivered; });
  NotifyOnError(callback);
  const std::size_t errorsBefore = GetErrorInfos().size();

  const Path title = ovratest::TestPath("Title");
  std::atomic<long> writes{0}, lost{0}, failures{0};
  std::vector<std::thread> threads;
  for (int t = 0; t < kWriters; ++t) {
    threads.emplace_back([&, t] {
      try {
        for (long round = 0; std::chrono::steady_clock::now() < deadline; ++round) {
          const fs::path& file = files[t][round % 3];
          const std::string value = "t" + std::to_string(t) + " round " + std::to_string(round);
          auto provider = ovratest::OpenFile(file);
          if (!provider->MetaDataAccess()) {
            ++failures;
            continue;
          }
          {
            MetaDataUpdateAccess access(provider);
            if (SetValue(*access, title, UTF8String(value))) access.AddChange(title);
          }
          ++writes;
          auto fresh = ovratest::OpenFile(file);
          if (ovratest::Text(fresh->MetaDataAccess(), title) != value) ++lost;
          if (utility::GetXMPFormat(ovratest::U16Path(file)) == 0x20202020) ++failures;
        }
      } catch (...) {
        ++failures;
      }
    });
  }
  std::atomic<long> sent{0};
  threads.emplace_back([&] {
    try {
      for (long round = 0; std::chrono::steady_clock::now() < deadline; ++round) {
        SendError(kPlainError, u"stress report " + ovracore::ToUTF16(std::to_string(round)), UTF16String());
        ++sent;
        ovraxmp::XMPMeta::RegisterNamespace("http://ns.example.org/stress/" + std::to_string(round) + "/",
                                            "st" + std::to_string(round), nullptr);
        const fs::path& file = files[kWriters][round % 3];
        if (round % 5 == 0) utility::EraseCachedXMPFormat(ovratest::U16Path(file));
        if (utility::GetXMPFormat(ovratest::U16Path(file)) == 0x20202020) ++failures;
        if (round % 256 == 0 && GetErrorInfos().size() < errorsBefore + static_cast<std::size_t>(sent.load())) ++lost;
      }
    } catch (...) {
      ++failures;
    }
  });
  for (std::thread& thread : threads) thread.join();
  callback->clear();

  EXPECT_GT(writes.load(), kWriters);
  EXPECT_EQ(lost.load(), 0);
  EXPECT_EQ(failures.load(), 0);
  EXPECT_EQ(GetErrorInfos().size(), errorsBefore + static_cast<std::size_t>(sent.load()));
  EXPECT_EQ(delivered->load(), sent.load());
}

}  // namespace
