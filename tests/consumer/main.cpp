// Starts the installed library, checks that the built-in definitions are
// there and that start-up reported nothing, and shuts it down again.
#include <cstdio>

#include <ovrametadata/ovrametadata.h>

int main() {
  ovrametadata::Initialize();
  const bool hasText = static_cast<bool>(ovrametadata::TypeIdDefinition("text"));
  const bool quiet = !ovrametadata::HasErrors();
  ovrametadata::Terminate();
  if (!hasText || !quiet) {
    std::fprintf(stderr, "consumer: built-in definitions %s, errors %s\n",
                 hasText ? "present" : "missing", quiet ? "none" : "reported");
    return 1;
  }
  return 0;
}
