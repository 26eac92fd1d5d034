// The least work a tool built on exempi's file handlers can do to set one
// property in many files the way the library's file provider does it: open
// each file read-only, take its packet and close it; then open it for
// update, put the packet with the edit and close it, which writes the file.
// No safe write, no sync, no aggregate, no checks of the file: what
// `ovrameta set` does beyond this is what it does for the files' safety and
// for editing them as one. bench/compare.sh times it beside ovrameta, so
// that the table shows how fast setting can get on the machine at hand.
//
//   set_floor THREADS FILE...    sets xmp:Label to "Reviewed" in place
//
// Files are shared out to THREADS threads; exit status 1 when a file could
// not be written.
#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <thread>
#include <vector>

#include <exempi/xmp.h>
#include <exempi/xmpconsts.h>

namespace {

// The open flags of the library's file provider: read-only or update, each
// with the toolkit's smart-handler bit.
constexpr int kRead = XMP_OPEN_READ | 0x400;
constexpr int kUpdate = XMP_OPEN_FORUPDATE | 0x400;

// Runs work(i) for every i in [0, count) on threads threads.
template <typename Work>
void Share(int threads, int count, Work work) {
  std::atomic<int> next{0};
  std::vector<std::thread> pool;
  for (int t = 0; t < threads; ++t)
    pool.emplace_back([&] {
      for (int i; (i = next++) < count;) work(i);
    });
  for (std::thread& thread : pool) thread.join();
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 3 || std::atoi(argv[1]) < 1) {
    std::fprintf(stderr, "usage: set_floor THREADS FILE...\n");
    return 2;
  }
  const int threads = std::atoi(argv[1]);
  const int count = argc - 2;
  char** files = argv + 2;
  if (!xmp_init()) return 2;
  std::vector<XmpPtr> packets(static_cast<std::size_t>(count), nullptr);
  std::atomic<int> failures{0};

  Share(threads, count, [&](int i) {
    XmpFilePtr file = xmp_files_open_new(files[i], static_cast<XmpOpenFileOptions>(kRead));
    if (!file) return;
    packets[i] = xmp_files_get_new_xmp(file);
    xmp_files_close(file, XMP_CLOSE_NOOPTION);
    xmp_files_free(file);
  });
  Share(threads, count, [&](int i) {
    XmpPtr packet = packets[i] ? packets[i] : xmp_new_empty();
    XmpFilePtr file = xmp_files_open_new(files[i], static_cast<XmpOpenFileOptions>(kUpdate));
    const bool ok = file && xmp_set_property(packet, NS_XAP, "Label", "Reviewed", 0) &&
                    xmp_files_put_xmp(file, packet) && xmp_files_close(file, XMP_CLOSE_NOOPTION);
    if (!ok) ++failures;
    if (file) xmp_files_free(file);
    xmp_free(packet);
  });
  xmp_terminate();
  return failures == 0 ? 0 : 1;
}
