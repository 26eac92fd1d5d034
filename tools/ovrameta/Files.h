// Private to the ovrameta tool (not part of the library's interface): the
// files a command works on, from its arguments, the folders walked with -r
// and the lists read with --files-from.
#pragma once

#include <string>
#include <vector>

namespace ovrameta {

struct FileOptions {
  bool recursive = false;
  // Taken from folders only: "jpg", ".JPG"; empty: every file.
  std::vector<std::string> extensions;
  // Files naming one file a line; "-" is standard input.
  std::vector<std::string> lists;
};

// Set once from the command line, before any command runs.
void SetFileOptions(const FileOptions& options);

// The files of a command: given as they are, then those of the lists. With
// -r a folder stands for the files below it, sorted, without hidden files
// and folders, not following linked folders; without -r it is a problem.
// Each file once. Problems (a folder, a list that cannot be read) are
// added as "WHAT: why" to problems; the files that remain are worked on.
std::vector<std::string> ExpandFiles(const std::vector<std::string>& given,
                                     std::vector<std::string>& problems);

}  // namespace ovrameta
