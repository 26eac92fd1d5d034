// The least work a tool on exempi can do to set one property in many files
// the way the library does: read each file as the library's file provider
// does (the toolkit's handler, read-only, with its native metadata), then put
// the edited packet back at its own place and length, written straight into
// the file. No safe write, no sync, no lock, no aggregate, no checks of the
// file and no check of what was written: what `ovrameta set` does beyond
// this is what it does for the files' safety, for keeping every other byte
// of the packet and for editing the files as one. A packet without room for
// the edit goes through the toolkit's own update instead. bench/compare.sh
// times it beside ovrameta.
//
//   set_floor THREADS FILE...    sets xmp:Label to "Reviewed"
//
// Files are shared out to THREADS threads; exit status 1 when a file could
// not be written.
#include <fcntl.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>
#include <vector>

#include <exempi/xmp.h>
#include <exempi/xmpconsts.h>

namespace {

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

// The packet at its own place and length; false when it has no room.
bool WriteInPlace(const char* path, const XmpPacketInfo& info, XmpPtr packet) {
  if (info.offset < 0 || info.length <= 0) return false;
  XmpStringPtr text = xmp_string_new();
  bool ok = xmp_serialize(packet, text, XMP_SERIAL_EXACTPACKETLENGTH, static_cast<uint32_t>(info.length));
  if (ok) {
    const int fd = ::open(path, O_WRONLY);
    ok = fd >= 0 && ::pwrite(fd, xmp_string_cstr(text), xmp_string_len(text), info.offset) ==
                        static_cast<ssize_t>(xmp_string_len(text));
    if (fd >= 0) ::close(fd);
  }
  xmp_string_free(text);
  return ok;
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
  std::atomic<int> failures{0};

  Share(threads, count, [&](int i) {
    XmpFilePtr file = xmp_files_open_new(files[i], XMP_OPEN_READ);
    if (!file) {
      ++failures;
      return;
    }
    XmpPtr shown = xmp_files_get_new_xmp(file);
    XmpStringPtr raw = xmp_string_new();
    XmpPacketInfo info{};
    const bool stored = xmp_files_get_xmp_xmpstring(file, raw, &info);
    xmp_files_close(file, XMP_CLOSE_NOOPTION);
    xmp_files_free(file);
    XmpPtr packet = stored ? xmp_new(xmp_string_cstr(raw), xmp_string_len(raw)) : xmp_new_empty();
    xmp_string_free(raw);
    if (shown) xmp_free(shown);
    bool ok = packet && xmp_set_property(packet, NS_XAP, "Label", "Reviewed", 0);
    if (ok && !WriteInPlace(files[i], info, packet)) {
      XmpFilePtr update = xmp_files_open_new(files[i], static_cast<XmpOpenFileOptions>(XMP_OPEN_FORUPDATE | XMP_OPEN_ONLYXMP));
      ok = update && xmp_files_put_xmp(update, packet) && xmp_files_close(update, XMP_CLOSE_NOOPTION);
      if (update) xmp_files_free(update);
    }
    if (packet) xmp_free(packet);
    if (!ok) ++failures;
  });
  xmp_terminate();
  return failures == 0 ? 0 : 1;
}
