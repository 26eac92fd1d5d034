// Private to the ovrameta tool (not part of the library's interface): the
// commands. Each returns the process exit status.
#pragma once

#include <string>
#include <vector>

#include <ovrametadata/Initialize.h>

namespace ovrameta {

enum ExitStatus {
  kExitSuccess = 0,
  kExitAbsent = 1,  // a named value is absent
  kExitUsage = 2,   // a usage error or an unreadable file
};

struct GetOptions {
  bool raw = false;
  bool json = false;
  bool csv = false;
};

// viewName: show that view only; fieldList: only the fields of that path
// list; neither: the views, then every other value.
int ShowCommand(const std::vector<std::string>& files, bool each, const std::string& viewName,
                const std::string& fieldList);
// arguments: files and names in any order (see SplitArguments).
int GetCommand(const std::vector<std::string>& arguments, const GetOptions& options);
struct EditOptions {
  std::vector<std::string> deletes;
  bool dryRun = false;        // print what would change, write nothing
  bool noSplit = false;       // a list value is one item, ";" and all
  bool preserveTime = false;  // keep each file's modification time
  std::string importFile;     // set --json FILE / --csv FILE
  bool importCSV = false;
};

// arguments: files and NAME=VALUE, NAME+=ITEM, NAME-=ITEM in any order.
int SetCommand(const std::vector<std::string>& arguments, const EditOptions& options);
// arguments: the file to copy from, the files to copy to, and the names of
// the properties to copy (every property when none is named).
int CopyCommand(const std::vector<std::string>& arguments, const EditOptions& options);
// prefixes: only those schemas (all when empty); xml: as a definitions file.
int SchemasCommand(const std::vector<std::string>& prefixes, bool xml);
// arguments: the view's name, then the prefixes of the schemas it shows.
int GenerateViewCommand(const std::vector<std::string>& arguments);
// name: print that view's layout; empty: list every registered view.
int ViewsCommand(const std::string& name);
// The registered extension packages and the problems found registering them.
int PackagesCommand(const std::vector<ovrametadata::ErrorInfo>& problems);

// Where each file's metadata is read from and written to (see Sidecars.h).
void SetSidecarOptions(bool always, bool fullName);

// Brings the library up for the lifetime of the object and relays the
// problems it reports to standard error.
class Session {
 public:
  Session();
  ~Session();
  Session(const Session&) = delete;
  Session& operator=(const Session&) = delete;
  bool ok() const { return mOk; }

 private:
  bool mOk = false;
};

}  // namespace ovrameta
