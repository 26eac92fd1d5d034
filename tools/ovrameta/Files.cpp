#include "Files.h"

#include <algorithm>
#include <cctype>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <set>

namespace ovrameta {

namespace fs = std::filesystem;

namespace {

FileOptions& Options() {
  static FileOptions options;
  return options;
}

std::string Lowered(std::string text) {
  std::transform(text.begin(), text.end(), text.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  return text;
}

bool Hidden(const fs::path& path) {
  const std::string name = path.filename().string();
  return !name.empty() && name.front() == '.';
}

// Endings compared as ".jpg" in lower case, so that "tar.gz" works too.
bool Wanted(const fs::path& file, const std::vector<std::string>& endings) {
  if (endings.empty()) return true;
  const std::string name = Lowered(file.filename().string());
  return std::any_of(endings.begin(), endings.end(), [&](const std::string& ending) {
    return name.size() > ending.size() && name.compare(name.size() - ending.size(), ending.size(), ending) == 0;
  });
}

// The files below folder, sorted. Linked folders are not followed: a link
// back up would never end.
std::vector<fs::path> Walk(const fs::path& folder, const std::vector<std::string>& endings,
                           std::vector<std::string>& problems) {
  std::vector<fs::path> files;
  std::error_code error;
  fs::recursive_directory_iterator it(folder, fs::directory_options::skip_permission_denied, error);
  if (error) {
    problems.push_back(folder.string() + ": cannot read folder: " + error.message());
    return files;
  }
  for (const fs::recursive_directory_iterator end; it != end;) {
    if (Hidden(it->path())) {
      it.disable_recursion_pending();
    } else if (it->is_regular_file(error) && Wanted(it->path(), endings)) {
      files.push_back(it->path());
    }
    it.increment(error);
    if (error) {
      problems.push_back(folder.string() + ": cannot read folder: " + error.message());
      break;
    }
  }
  std::sort(files.begin(), files.end());
  return files;
}

// The names in a list, one a line; false when it cannot be read.
bool ReadList(const std::string& list, std::vector<std::string>& names) {
  std::ifstream file;
  if (list != "-") {
    file.open(list);
    if (!file) return false;
  }
  std::istream& in = list == "-" ? std::cin : file;
  for (std::string line; std::getline(in, line);) {
    // Lists written on Windows end their lines with "\r\n".
    if (!line.empty() && line.back() == '\r') line.pop_back();
    if (!line.empty()) names.push_back(line);
  }
  return !in.bad();
}

}  // namespace

void SetFileOptions(const FileOptions& options) { Options() = options; }

std::vector<std::string> ExpandFiles(const std::vector<std::string>& given,
                                     std::vector<std::string>& problems) {
  const FileOptions& options = Options();
  std::vector<std::string> named = given;
  for (const std::string& list : options.lists) {
    if (!ReadList(list, named))
      problems.push_back((list == "-" ? "standard input" : list) + ": cannot read the file list");
  }
  std::vector<std::string> endings;
  for (const std::string& extension : options.extensions) {
    if (extension.empty() || extension == ".") continue;
    endings.push_back(Lowered(extension.front() == '.' ? extension : "." + extension));
  }

  std::vector<std::string> files;
  std::set<fs::path> seen;
  auto add = [&](const fs::path& file) {
    if (seen.insert(file.lexically_normal()).second) files.push_back(file.string());
  };
  for (const std::string& name : named) {
    std::error_code error;
    // A link to a folder named on the command line is walked: it was asked for.
    if (!fs::is_directory(name, error)) {
      add(name);
    } else if (!options.recursive) {
      problems.push_back(name + ": is a folder (use -r to walk it)");
    } else {
      for (const fs::path& file : Walk(name, endings, problems)) add(file);
    }
  }
  return files;
}

}  // namespace ovrameta
