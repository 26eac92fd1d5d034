#include "Commands.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <map>
#include <fstream>
#include <iostream>
#include <memory>
#include <set>
#include <sstream>
#include <utility>

#include <boost/make_shared.hpp>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/stat.h>
#include <nlohmann/json.hpp>
#include <unistd.h>

#include <ovrametadata/ovrametadata.h>

#include "Files.h"
#include "Lists.h"
#include "Names.h"
#include "Parallel.h"
#include "Progress.h"
#include "Sidecars.h"
#include "Transfer.h"
#include "Reading.h"
#include "TextUtil.h"
#include "Validation.h"
#include "ViewShow.h"

namespace ovrameta {

using namespace ovrametadata;
using Json = nlohmann::ordered_json;

namespace {

constexpr XMP_FileFormat kUnknownFormat = 0x20202020;

// ---------------------------------------------------------------------------
// Messages and exit status

// Problems the library reports while the tool works; printed with the name
// of the file being worked on. The library reports on the thread that
// works, so every thread keeps its own list.
std::vector<std::string>& LibraryMessages() {
  thread_local std::vector<std::string> messages;
  return messages;
}

// The library names properties by namespace URI and name
// ("http://ns.adobe.com/xap/1.0/Rating"); people know them as "xmp:Rating".
std::string WithPrefixedNames(std::string message) {
  static const std::vector<std::pair<std::string, std::string>> namespaces = [] {
    std::vector<std::pair<std::string, std::string>> all;
    for (const auto& schema : KnownSchemas()) all.emplace_back("\"" + schema->namespaceURI, "\"" + schema->prefix + ":");
    // The longest first: one namespace URI may begin another.
    std::sort(all.begin(), all.end(), [](const auto& a, const auto& b) { return a.first.size() > b.first.size(); });
    return all;
  }();
  for (const auto& [uri, prefix] : namespaces) {
    for (auto at = message.find(uri); at != std::string::npos; at = message.find(uri, at + prefix.size()))
      message.replace(at, uri.size(), prefix);
  }
  return message;
}

class Reporter {
 public:
  explicit Reporter(Progress* progress = nullptr) : mProgress(progress) {}

  // A reporter that keeps its messages until another one relays them: the
  // work on one file runs on a worker thread, its messages are printed in
  // the order of the files.
  static Reporter Buffered() {
    Reporter reporter;
    reporter.mBuffered = true;
    return reporter;
  }

  void SetProgress(Progress* progress) { mProgress = progress; }

  // "ovrameta: <context>: <message>", and the status becomes at least status.
  void Error(const std::string& context, const std::string& message, int status) {
    Emit("ovrameta: " + (context.empty() ? "" : context + ": ") + message + "\n");
    mStatus = std::max(mStatus, status);
  }

  // Relays what the library reported on this thread since the last call,
  // each report once.
  void FlushLibrary(const std::string& context) {
    auto& messages = LibraryMessages();
    for (const auto& message : messages) {
      const std::string line = "ovrameta: " + (context.empty() ? "" : context + ": ") + "warning: " +
                               WithPrefixedNames(message) + "\n";
      if (mRelayed.insert(line).second) Emit(line);
    }
    messages.clear();
  }

  // Prints what a buffered reporter kept and takes over its status.
  void Relay(Reporter& other) {
    if (!other.mBuffer.empty()) Emit(other.mBuffer);
    other.mBuffer.clear();
    mStatus = std::max(mStatus, other.mStatus);
  }

  int status() const { return mStatus; }

 private:
  void Emit(const std::string& text) {
    if (mBuffered) {
      mBuffer += text;
      return;
    }
    if (mProgress) mProgress->Clear();
    std::cerr << text << std::flush;
  }

  Progress* mProgress;
  std::set<std::string> mRelayed;
  int mStatus = kExitSuccess;
  bool mBuffered = false;
  std::string mBuffer;
};

std::string Quoted(const std::string& text) { return "\"" + text + "\""; }

// Several files named in one message: all of them when few, else the first
// and a count.
std::string FileList(const std::vector<std::string>& files) {
  if (files.size() <= 3) {
    std::string list;
    for (const auto& file : files) list += (list.empty() ? "" : ", ") + file;
    return list;
  }
  return files.front() + " and " + std::to_string(files.size() - 1) + " other files";
}

// ---------------------------------------------------------------------------
// Files

// Holds its write-back until Flush, so that the files of one edit can be
// written side by side on several threads once the edit is complete.
class BatchedFileProvider : public FileProvider {
 public:
  using FileProvider::FileProvider;

  void WriteChanges(const std::vector<Path>& paths) override {
    mPending.insert(mPending.end(), paths.begin(), paths.end());
    mHasPending = true;
  }

  bool Pending() const { return mHasPending; }

  // Writes what the last write-backs asked for; nothing when none did.
  // The reason when the file was to be written and was left as it was.
  std::string Flush() {
    if (!mHasPending) return std::string();
    mHasPending = false;
    FileProvider::WriteChanges(std::exchange(mPending, std::vector<Path>()));
    return ToUTF8(LastWriteFailure());
  }

 private:
  std::vector<Path> mPending;
  bool mHasPending = false;
};

struct OpenedFile {
  std::string given;  // as named on the command line
  std::string name;   // the file read: the given one or its sidecar
  bool created = false;  // a sidecar made for this edit
  boost::shared_ptr<FileProvider> provider;
  boost::shared_ptr<BatchedFileProvider> batched;  // set when opened for a batched write
};

// Opens one media file. An unreadable file, or one the toolkit cannot
// handle, is reported (status 2) and gives false. A readable file without
// XMP gives a provider without metadata.
SidecarOptions& Sidecars() {
  static SidecarOptions options;
  return options;
}

bool OpenFile(const std::string& given, Reporter& reporter, OpenedFile& out,
              bool batchWrites = false) {
  std::error_code error;
  const std::string name = MetadataFile(given, Sidecars(), batchWrites);
  bool created = false;
  if (name != given) {
    if (!std::filesystem::is_regular_file(given, error)) {
      reporter.Error(given, "cannot read file: No such file or directory", kExitUsage);
      return false;
    }
    // A sidecar that a write needs is made; it goes again if nothing is written.
    if (batchWrites && !std::filesystem::exists(name, error)) {
      if (!CreateSidecar(name)) {
        reporter.Error(name, std::string("cannot make the sidecar: ") + std::strerror(errno), kExitUsage);
        return false;
      }
      created = true;
    }
  }
  struct RemoveUnused {
    const std::string& path;
    bool& remove;
    ~RemoveUnused() {
      if (remove) std::filesystem::remove(path);
    }
  };
  bool removeSidecar = created;
  const RemoveUnused cleanup{name, removeSidecar};
  // One status for both checks: runs over many files pay per system call.
  const auto status = std::filesystem::status(name, error);
  if (!std::filesystem::exists(status)) {
    reporter.Error(name, "cannot read file: No such file or directory", kExitUsage);
    return false;
  }
  if (!std::filesystem::is_regular_file(status)) {
    reporter.Error(name, "cannot read file: not a regular file", kExitUsage);
    return false;
  }
  const int probe = ::open(name.c_str(), O_RDONLY | O_CLOEXEC);
  if (probe < 0) {
    reporter.Error(name, std::string("cannot read file: ") + std::strerror(errno), kExitUsage);
    return false;
  }
  ::close(probe);
  // Media applications hand the toolkit absolute paths; its handlers for
  // folder-based formats misread relative ones with a folder in them. The
  // working folder is asked once.
  static const std::filesystem::path workingFolder = std::filesystem::current_path(error);
  const std::filesystem::path relative(name);
  const std::filesystem::path absolute =
      relative.is_absolute() || workingFolder.empty() ? std::filesystem::absolute(relative, error)
                                                      : workingFolder / relative;
  const UTF16String path = ToUTF16(absolute.lexically_normal().string());
  boost::shared_ptr<FileProvider> provider;
  if (batchWrites) {
    out.batched = boost::make_shared<BatchedFileProvider>(path);
    provider = out.batched;
  } else {
    provider = boost::make_shared<FileProvider>(path);
  }
  reporter.FlushLibrary(name);
  if (!provider->MetaDataAccess() && utility::GetXMPFormat(path) == kUnknownFormat) {
    reporter.Error(name, "cannot read file: not a media file with metadata support", kExitUsage);
    out.batched.reset();
    return false;
  }
  out.given = given;
  out.name = name;
  out.created = created;
  out.provider = provider;
  removeSidecar = false;
  return true;
}

// Arguments that name properties (or assignments) rather than files. A
// path that exists is always a file.
bool IsExistingPath(const std::string& argument) {
  std::error_code error;
  return std::filesystem::exists(argument, error);
}

// The files of a command, with folders and lists (see ExpandFiles); what
// cannot be taken is reported.
std::vector<std::string> FilesOf(const std::vector<std::string>& given, Reporter& reporter) {
  std::vector<std::string> problems;
  std::vector<std::string> files = ExpandFiles(given, problems);
  for (const auto& problem : problems) reporter.Error("", problem, kExitUsage);
  return files;
}

// ---------------------------------------------------------------------------
// Printing

// The path description of a value named "prefix:Description".
std::string DescriptionOf(const std::string& name) { return name.substr(name.find(':') + 1); }

// Drops the values, and the fields of structures, that a view has shown.
bool Unshown(const std::string& namespaceURI, const ShownKeys& shown, ValueNode& node) {
  if (shown.count(ShownKey(namespaceURI, DescriptionOf(node.name)))) return false;
  if (node.kind != ValueNode::kStruct) return true;
  auto& fields = node.children;
  fields.erase(std::remove_if(fields.begin(), fields.end(),
                              [&](ValueNode& field) { return !Unshown(namespaceURI, shown, field); }),
               fields.end());
  return !fields.empty();
}

// One packet as show prints it: the named view; or, without a name, the
// built-in views with their empty items left out, then every other value
// under the label of its schema, so that nothing the packet holds goes
// unseen.
std::string ShowText(const boost::shared_ptr<MetaDataProvider>& provider, const std::string& viewName,
                     const std::vector<Path>* fields) {
  if (fields) return FieldsText(provider, *fields);
  std::string text;
  ShownKeys shown;
  {
    MetaDataReadAccess reader(provider);
    XMPMetaRef xmp = *reader;
    if (!viewName.empty()) return ViewText(xmp, GetViewDefinitionForName(viewName));
    if (xmp)
      for (const ViewDefinitionPtr& view : ShownViews()) text += CompactViewText(xmp, view, shown);
  }
  std::vector<SchemaValues> rest = ReadAllValues(provider, ReadOptions());
  std::ostringstream out;
  for (SchemaValues& schema : rest) {
    auto& values = schema.values;
    values.erase(std::remove_if(values.begin(), values.end(),
                                [&](ValueNode& node) {
                                  return !Unshown(schema.schema->namespaceURI, shown, node);
                                }),
                 values.end());
    if (values.empty()) continue;
    out << schema.label << '\n';
    for (const auto& value : values) PrintNode(out, value, 1);
  }
  {
    MetaDataReadAccess reader(provider);
    for (const UndefinedValues& undefined : ReadUndefinedValues(*reader)) {
      out << undefined.prefix << " (" << undefined.namespaceURI << ", no definition)\n";
      for (const auto& value : undefined.values) PrintNode(out, value, 1);
    }
  }
  text += out.str();
  return text.empty() ? "(no metadata)\n" : text;
}

// "name = value" lines for every leaf below node (arrays of simple values
// as one line, their items joined).
void PrintFlat(std::ostream& out, const std::string& prefix, const ValueNode& node, bool raw) {
  if (node.kind == ValueNode::kStruct ||
      (node.kind == ValueNode::kArray && !node.children.empty() &&
       node.children.front().kind != ValueNode::kSimple)) {
    for (const auto& child : node.children) PrintFlat(out, prefix, child, raw);
    return;
  }
  const std::string text = node.mixed ? "(mixed)" : raw && node.raw ? *node.raw : node.value;
  out << prefix << node.name << " = " << text << '\n';
  for (const auto& language : node.languages) {
    if (language.first != "x-default")
      out << prefix << node.name << "[@" << language.first << "] = " << language.second << '\n';
  }
}

Json NodeJson(const ValueNode& node, bool withSchema) {
  Json json;
  json["name"] = node.name;
  if (withSchema) json["schema"] = node.name.substr(0, node.name.find(':'));
  json["label"] = node.label;
  json["type"] = node.typeText;
  if (!node.primitive.empty()) json["primitive"] = node.primitive;
  if (node.mixed) {
    json["mixed"] = true;
    return json;
  }
  switch (node.kind) {
    case ValueNode::kSimple:
      json["value"] = node.value;
      json["raw"] = node.raw ? Json(*node.raw) : Json(nullptr);
      if (!node.languages.empty()) {
        Json languages = Json::object();
        for (const auto& language : node.languages) languages[language.first] = language.second;
        json["languages"] = languages;
      }
      break;
    case ValueNode::kStruct: {
      Json fields = Json::array();
      for (const auto& child : node.children) fields.push_back(NodeJson(child, false));
      json["fields"] = fields;
      break;
    }
    case ValueNode::kArray: {
      if (!node.value.empty() || node.raw) {
        json["value"] = node.value;
        json["raw"] = node.raw ? Json(*node.raw) : Json(nullptr);
      }
      Json items = Json::array();
      for (const auto& child : node.children) items.push_back(NodeJson(child, false));
      json["items"] = items;
      break;
    }
  }
  return json;
}

// One language of an alternative, as a simple value.
bool ReadLanguage(XMPMetaRef xmp, const ResolvedName& name, const ReadOptions& options,
                  ValueNode& node) {
  UTF8String text;
  if (!GetAltTextValue(xmp, name.path, name.language, text)) return false;
  node.name = name.name;
  node.label = name.label + " [" + name.language + "]";
  if (options.types) node.typeText = "text";
  node.value = node.read = text;
  if (options.raw) node.raw = text;
  return true;
}

// One CSV row per file: the named columns, or every column some file has,
// in the order they first come.
void PrintTable(const std::vector<std::vector<Cell>>& rows, const std::vector<std::string>& names) {
  // Named structures come as their fields, so the columns are what the
  // rows hold; a name no file has is a column all the same.
  std::vector<std::string> columns = {"file"};
  std::set<std::string> known(columns.begin(), columns.end());
  for (const auto& row : rows)
    for (const auto& cell : row)
      if (known.insert(cell.first).second) columns.push_back(cell.first);
  for (const auto& name : names)
    if (known.insert(WithoutLanguage(name, nullptr)).second && !known.count(name)) columns.push_back(name);
  std::string line;
  for (const auto& column : columns) line += (line.empty() ? "" : ",") + CSVField(column);
  std::cout << line << '\n';
  for (const auto& row : rows) {
    std::map<std::string, std::string> values(row.begin(), row.end());
    line.clear();
    for (std::size_t i = 0; i < columns.size(); ++i) line += (i ? "," : "") + CSVField(values[columns[i]]);
    std::cout << line << '\n';
  }
}

// The status of a command whose file list was checked apart (see FilesOf).
int StatusWith(Reporter& reporter, Reporter& listing) {
  reporter.Relay(listing);
  return reporter.status();
}

// ---------------------------------------------------------------------------
// Arguments

struct Assignment {
  ResolvedName name;
  std::string value;
};

// Splits the positional arguments of get and set into files and names.
void SplitArguments(const std::vector<std::string>& arguments, std::vector<std::string>& files,
                    std::vector<std::string>& names) {
  for (const auto& argument : arguments) {
    const auto equals = argument.find('=');
    std::string head = equals == std::string::npos ? argument : argument.substr(0, equals);
    if (equals != std::string::npos && !head.empty() && (head.back() == '+' || head.back() == '-')) head.pop_back();
    // Also names gone wrong, to be answered with the registered one:
    // "title=x", and "title" when a property has that name.
    const bool plain = head.find_first_of("/.") == std::string::npos;
    const bool name =
        LooksLikeName(head) || (plain && (equals != std::string::npos || !SuggestName(head).empty()));
    if (name && !IsExistingPath(argument)) {
      names.push_back(argument);
    } else {
      files.push_back(argument);
    }
  }
}

}  // namespace

// ---------------------------------------------------------------------------
// Session

Session::Session() {
  try {
    Initialize();
  } catch (const std::exception& error) {
    std::cerr << "ovrameta: cannot start the XMP toolkit: " << error.what() << std::endl;
    return;
  }
  mOk = true;
  // Start-up problems (a broken custom definitions file) come first.
  for (const auto& info : GetErrorInfos()) {
    const std::string source = ToUTF8(info.source);
    std::cerr << "ovrameta: " << (source.empty() ? "" : source + ": ") << "warning: "
              << ToUTF8(info.message) << std::endl;
  }
  // The library shares the callback; it lives until Terminate.
  NotifyOnError(boost::make_shared<ErrorCallback>(
      [](const UTF16String& message) { LibraryMessages().push_back(ToUTF8(message)); }));
}

Session::~Session() {
  if (mOk) Terminate();
}

// ---------------------------------------------------------------------------
// show

int ShowCommand(const std::vector<std::string>& given, bool each, const std::string& viewName,
                const std::string& fieldList) {
  Reporter reporter;
  const std::vector<std::string> files = FilesOf(given, reporter);
  if (files.empty()) {
    if (reporter.status() == kExitSuccess) reporter.Error("", "show: no file found", kExitUsage);
    return reporter.status();
  }
  std::vector<Path> fieldPaths;
  if (!fieldList.empty() && !ReadFieldList(fieldList, fieldPaths)) return kExitUsage;
  const std::vector<Path>* fields = fieldList.empty() ? nullptr : &fieldPaths;
  if (!viewName.empty() && !GetViewDefinitionForName(viewName)) {
    reporter.Error("", "no view is named " + Quoted(viewName) + " (ovrameta views lists them)", kExitUsage);
    return reporter.status();
  }
  if (files.size() == 1 || each) {
    struct Shown {
      Reporter notes = Reporter::Buffered();
      bool opened = false;
      std::string text;
    };
    std::vector<Shown> shown(files.size());
    bool first = true;
    ForEachInOrder(
        files.size(), Jobs(),
        [&](std::size_t i) {
          Shown& out = shown[i];
          OpenedFile file;
          if (!OpenFile(files[i], out.notes, file)) return;
          out.opened = true;
          out.text = ShowText(file.provider, viewName, fields);
          out.notes.FlushLibrary(files[i]);
        },
        [&](std::size_t i) {
          Shown& out = shown[i];
          reporter.Relay(out.notes);
          if (out.opened) {
            if (files.size() > 1) std::cout << (first ? "" : "\n") << "== " << files[i] << " ==\n";
            first = false;
            std::cout << out.text;
          }
          out = Shown();
        });
    return reporter.status();
  }

  // Several files: one aggregate, with "(mixed)" where the files differ.
  Progress progress(files.size(), "files read");
  reporter.SetProgress(&progress);
  auto aggregate = boost::make_shared<AggregateProvider>();
  std::size_t opened = 0;
  std::vector<std::pair<OpenedFile, Reporter>> read(files.size(),
                                                   {OpenedFile(), Reporter::Buffered()});
  ForEachInOrder(
      files.size(), Jobs(),
      [&](std::size_t i) { OpenFile(files[i], read[i].second, read[i].first); },
      [&](std::size_t i) {
        reporter.Relay(read[i].second);
        if (read[i].first.provider) {
          aggregate->AddProvider(read[i].first.provider, false);
          ++opened;
        }
        read[i].first = OpenedFile();
        progress.Step();
      });
  aggregate->OnProxyMetaDataChange(nullptr);
  progress.Clear();
  reporter.SetProgress(nullptr);
  if (opened == 0) return reporter.status();
  std::cout << ShowText(aggregate, viewName, fields);
  reporter.FlushLibrary(std::to_string(opened) + " files");
  return reporter.status();
}

// ---------------------------------------------------------------------------
// get

int GetCommand(const std::vector<std::string>& arguments, const GetOptions& options) {
  Reporter reporter;
  std::vector<std::string> files;
  std::vector<std::string> nameTexts;
  SplitArguments(arguments, files, nameTexts);
  // Files that cannot be taken count in the exit status, not in the checks
  // of what is asked: the other files are worked on.
  Reporter listing;
  files = FilesOf(files, listing);
  if (files.empty()) {
    if (listing.status() == kExitSuccess) listing.Error("", "get: no file given", kExitUsage);
    return listing.status();
  }
  if (nameTexts.empty() && !options.json && !options.csv) {
    reporter.Error("", "get: no property name given (prefix:Property), or use --json or --csv", kExitUsage);
    return reporter.status();
  }
  std::vector<ResolvedName> names;
  for (const auto& text : nameTexts) {
    ResolvedName name;
    std::string error;
    if (text.find('=') != std::string::npos) {
      reporter.Error("", Quoted(text) + ": get takes names, not assignments", kExitUsage);
    } else if (ResolveName(text, name, error)) {
      names.push_back(name);
    } else if (!SchemaForPrefix(text.substr(0, text.find(':'))) && SuggestName(text).empty()) {
      // No definition: looked up by the prefix each file declares.
      name.name = name.label = text;
      names.push_back(name);
    } else {
      reporter.Error("", error, kExitUsage);
    }
  }
  if (reporter.status() != kExitSuccess) return reporter.status();

  ReadOptions readOptions;
  const bool machine = options.json || options.csv;
  readOptions.raw = options.raw || machine;
  readOptions.items = machine;
  readOptions.types = options.json;
  const bool bare = files.size() == 1 && names.size() == 1 && !machine;
  struct Read {
    Reporter notes = Reporter::Buffered();
    std::string text;  // for standard output
    Json entry;        // with --json
    std::vector<Cell> cells;  // with --csv
  };
  std::vector<Read> reads(files.size());
  Json output = Json::array();
  std::vector<std::vector<Cell>> table;
  Progress progress(files.size(), "files read");
  reporter.SetProgress(&progress);
  // Reading stored text flips a process-wide switch around each read, so
  // raw reads run on one thread.
  const unsigned jobs = readOptions.raw ? 1 : Jobs();
  ForEachInOrder(
      files.size(), jobs,
      [&](std::size_t i) {
        const std::string& fileName = files[i];
        Read& out = reads[i];
        OpenedFile file;
        if (!OpenFile(fileName, out.notes, file)) return;
        MetaDataReadAccess reader(file.provider);
        Json properties = Json::array();
        if (names.empty()) {
          for (const auto& schema : ReadAllValues(file.provider, readOptions)) {
            for (const auto& value : schema.values) {
              if (options.csv) Flatten(value, out.cells);
              else properties.push_back(NodeJson(value, true));
            }
          }
          for (const auto& undefined : ReadUndefinedValues(*reader)) {
            for (const auto& value : undefined.values) {
              if (options.csv) Flatten(value, out.cells);
              else properties.push_back(NodeJson(value, true));
            }
          }
        }
        std::ostringstream text;
        const bool anyUndefined =
            std::any_of(names.begin(), names.end(), [](const ResolvedName& n) { return !n.entry; });
        const auto namespaces = anyUndefined ? GetStoredNamespaces(*reader) : std::vector<StoredNamespace>();
        for (const auto& name : names) {
          ValueNode node;
          const bool found = !name.entry ? ReadUndefinedValue(*reader, name.name, node)
                             : name.language.empty()
                                 ? ReadValue(*reader, name.path, name.name, readOptions, node)
                                 : ReadLanguage(*reader, name, readOptions, node);
          // A raw read of a value that is only constructed finds nothing stored.
          const bool stored = found && (!options.raw || node.raw || node.kind != ValueNode::kSimple);
          if (!stored) {
            const std::string prefix = name.name.substr(0, name.name.find(':'));
            const bool declared = name.entry || std::any_of(namespaces.begin(), namespaces.end(),
                                                            [&](const auto& ns) { return ns.prefix == prefix; });
            out.notes.Error(fileName,
                            name.name + ": no " + (found ? "stored " : "") + "value" +
                                (declared ? "" : " (no definition has the prefix " + Quoted(prefix) + ", nor does the file)"),
                            kExitAbsent);
            if (options.json) {
              Json missing;
              missing["name"] = name.name;
              missing["label"] = name.label;
              missing["type"] = name.entry ? TypeText(*name.entry) : std::string();
              missing["value"] = nullptr;
              properties.push_back(missing);
            }
            continue;
          }
          if (options.csv) {
            Flatten(node, out.cells);
          } else if (options.json) {
            properties.push_back(NodeJson(node, true));
          } else if (bare && node.kind == ValueNode::kSimple) {
            text << (options.raw && node.raw ? *node.raw : node.value) << '\n';
          } else if (bare && node.kind == ValueNode::kArray &&
                     (node.children.empty() || node.children.front().kind == ValueNode::kSimple)) {
            text << (options.raw && node.raw ? *node.raw : node.value) << '\n';
          } else {
            PrintFlat(text, files.size() > 1 ? fileName + ": " : std::string(), node, options.raw);
          }
        }
        out.notes.FlushLibrary(fileName);
        out.text = text.str();
        if (options.json) {
          out.entry["file"] = fileName;
          out.entry["properties"] = std::move(properties);
        }
        if (options.csv) out.cells.insert(out.cells.begin(), Cell("file", fileName));
      },
      [&](std::size_t i) {
        Read& out = reads[i];
        reporter.Relay(out.notes);
        if (!out.text.empty()) {
          progress.Clear();
          std::cout << out.text;
        }
        if (!out.entry.is_null()) output.push_back(std::move(out.entry));
        if (!out.cells.empty()) table.push_back(std::move(out.cells));
        out = Read();
        progress.Step();
      });
  progress.Clear();
  if (options.json) std::cout << output.dump(2) << '\n';
  if (options.csv) PrintTable(table, nameTexts);
  reporter.Relay(listing);
  return reporter.status();
}

// ---------------------------------------------------------------------------
// set

// The first array item named in name ("dc:subject[9]" in
// "dc:subject[9]", "xmpDM:markers[2]" in "xmpDM:markers[2]/xmpDM:name")
// that the packet does not hold; empty when every one exists.
std::string MissingArrayItem(XMPMetaRef xmp, const std::string& fullName) {
  const std::string name = WithoutLanguage(fullName, nullptr);
  for (std::size_t close = name.find(']'); close != std::string::npos; close = name.find(']', close + 1)) {
    ResolvedName item;
    std::string error;
    if (ResolveName(name.substr(0, close + 1), item, error) && !HasValue(xmp, item.path))
      return name.substr(0, close + 1);
  }
  return std::string();
}

namespace {

// One change asked for: NAME=VALUE, NAME+=ITEM, NAME-=ITEM, --delete NAME.
struct Edit {
  enum Kind { kSet, kAdd, kRemove, kDelete };
  Kind kind = kSet;
  ResolvedName name;
  std::string value;
};

bool IsListOfText(const ResolvedName& name) {
  const auto primitive = PrimitiveTypeOfPath(name.path);
  return primitive && (*primitive == kPrimitiveType_bag || *primitive == kPrimitiveType_seq);
}

// Reads "NAME=VALUE", "NAME+=ITEM" or "NAME-=ITEM"; the value is checked
// against the definitions and put in its stored form. The reason when not.
bool ParseEdit(const std::string& text, bool noSplit, Edit& out, std::string& error) {
  const auto equals = text.find('=');
  if (equals == std::string::npos) {
    error = Quoted(text) + ": expected NAME=VALUE";
    return false;
  }
  Edit edit;
  std::string name = text.substr(0, equals);
  if (!name.empty() && (name.back() == '+' || name.back() == '-')) {
    edit.kind = name.back() == '+' ? Edit::kAdd : Edit::kRemove;
    name.pop_back();
  }
  if (!ResolveName(name, edit.name, error)) return false;
  edit.value = text.substr(equals + 1);
  const bool list = IsListOfText(edit.name);
  if (edit.kind != Edit::kSet && (!list || !edit.name.language.empty())) {
    error = Quoted(text) + ": " + name + " is not a list; += and -= add and remove list items";
    return false;
  }
  // One item: the library would split it at ";".
  if ((noSplit || edit.kind != Edit::kSet) && list) edit.value = ItemsText({edit.value});
  const std::string reason = CheckValue(edit.name.path, *edit.name.entry, edit.value);
  if (!reason.empty()) {
    error = name + ": refused: " + reason;
    return false;
  }
  out = std::move(edit);
  return true;
}

// The texts of the items of a list, as stored.
std::vector<std::string> ItemTexts(XMPMetaRef xmp, const Path& path) {
  std::vector<std::string> items;
  const int count = CountArrayItems(xmp, path);
  for (int i = 1; i <= count; ++i) {
    UTF8String text;
    GetValue(xmp, CreatePathFromArrayItem(path, i), text);
    items.push_back(text);
  }
  return items;
}

// The text of one item, as ItemsText wrote it: quotes undone.
std::string ItemOf(const std::string& text) {
  if (text.size() < 2 || text.front() != '"' || text.back() != '"') return text;
  std::string item;
  for (std::size_t i = 1; i + 1 < text.size(); ++i) {
    item += text[i];
    if (text[i] == '"') ++i;
  }
  return item;
}

// Applies edits to one packet: an aggregate's, or one file's. List edits
// go to files one by one (an item is added where it is missing), the others
// where they are given. False when one could not go in.
bool ApplyEdits(XMPMetaRef xmp, const std::vector<Edit>& edits, bool listEdits, std::vector<Path>& changes,
                Reporter& reporter, const std::string& context) {
  const int before = reporter.status();
  for (const Edit& edit : edits) {
    const bool listEdit = edit.kind == Edit::kAdd || edit.kind == Edit::kRemove;
    if (listEdit != listEdits) continue;
    const auto& name = edit.name;
    const std::size_t reports = GetErrorInfos().size();
    switch (edit.kind) {
      case Edit::kSet: {
        const std::string missing = MissingArrayItem(xmp, name.name);
        if (!missing.empty()) {
          reporter.Error(context, name.name + ": " + missing + " does not exist", kExitUsage);
          continue;
        }
        // A value already there is not written again.
        const bool written = name.language.empty() ? SetValue(xmp, name.path, edit.value)
                                                   : SetAltTextValue(xmp, name.path, name.language, edit.value);
        if (written) changes.push_back(name.path);
        break;
      }
      case Edit::kDelete:
        if (DeleteValue(xmp, name.path)) {
          changes.push_back(name.path);
        } else {
          reporter.Error(context, name.name + ": no value to delete", kExitAbsent);
        }
        break;
      case Edit::kAdd: {
        const std::string item = ItemOf(edit.value);
        const auto items = ItemTexts(xmp, name.path);
        if (std::find(items.begin(), items.end(), item) != items.end()) break;
        const int count = static_cast<int>(items.size());
        if (AddArrayItem(xmp, name.path, count) &&
            SetValue(xmp, CreatePathFromArrayItem(name.path, count + 1), item))
          changes.push_back(name.path);
        break;
      }
      case Edit::kRemove: {
        const std::string item = ItemOf(edit.value);
        const auto items = ItemTexts(xmp, name.path);
        for (int i = static_cast<int>(items.size()); i-- > 0;) {
          if (items[i] == item && DeleteArrayItem(xmp, name.path, i)) changes.push_back(name.path);
        }
        break;
      }
    }
    // The library reports a value it could not write, or that did not read
    // back as written.
    if (GetErrorInfos().size() != reports)
      reporter.Error(context, name.name + ": the value could not be written", kExitUsage);
  }
  reporter.FlushLibrary(context);
  return reporter.status() == before;
}

// What each named value of a file reads as, for --dry-run.
std::map<std::string, std::string> ReadNamed(const OpenedFile& file, const std::vector<Edit>& edits) {
  std::map<std::string, std::string> values;
  MetaDataReadAccess reader(file.provider);
  for (const Edit& edit : edits) {
    ValueNode node;
    const auto& name = edit.name;
    std::string text;
    if (!name.language.empty()) {
      UTF8String one;
      if (GetAltTextValue(*reader, name.path, name.language, one)) text = Quoted(one);
    } else if (ReadValue(*reader, name.path, name.name, ReadOptions(), node)) {
      text = Quoted(node.mixed ? "(mixed)" : node.value);
    }
    values[name.name] = text.empty() ? "(none)" : text;
  }
  return values;
}

// What an edit goes through: the one file, or an aggregate of all of them,
// so that values that differ stay as each file has them.
boost::shared_ptr<MetaDataProvider> EditTarget(const std::vector<OpenedFile>& opened) {
  if (opened.size() == 1) return opened.front().provider;
  auto aggregate = boost::make_shared<AggregateProvider>();
  for (const auto& file : opened) aggregate->AddProvider(file.provider, false);
  aggregate->OnProxyMetaDataChange(nullptr);
  return aggregate;
}

// Opens the files to edit; those that cannot be read are named and left
// out. Files without XMP start from an empty packet.
std::vector<OpenedFile> OpenForEdit(const std::vector<std::string>& files, Reporter& reporter) {
  Progress progress(files.size(), "files read");
  reporter.SetProgress(&progress);
  std::vector<OpenedFile> opened;
  std::vector<std::pair<OpenedFile, Reporter>> read(files.size(), {OpenedFile(), Reporter::Buffered()});
  ForEachInOrder(
      files.size(), Jobs(), [&](std::size_t i) { OpenFile(files[i], read[i].second, read[i].first, true); },
      [&](std::size_t i) {
        reporter.Relay(read[i].second);
        if (read[i].first.provider) opened.push_back(std::move(read[i].first));
        progress.Step();
      });
  progress.Clear();
  reporter.SetProgress(nullptr);
  for (auto& file : opened)
    if (!file.provider->MetaDataAccess()) file.provider->ResetToEmptyMetaData(false);
  return opened;
}

// Writes the edited files side by side (the edit is complete in every
// packet by now), or with --dry-run prints what would change. Sidecars
// made for the edit go again when their file is not written.
void WriteEdited(std::vector<OpenedFile>& opened, const EditOptions& options, Reporter& reporter,
                 std::size_t& failed, std::size_t& unchanged,
                 const std::vector<std::map<std::string, std::string>>& before, const std::vector<Edit>& edits) {
  for (const auto& file : opened) {
    if (file.batched->Pending()) continue;
    ++unchanged;
    if (file.created) std::filesystem::remove(file.name);
  }
  if (options.dryRun) {
    for (std::size_t i = 0; i < opened.size(); ++i) {
      const auto after = ReadNamed(opened[i], edits);
      bool any = false;
      for (const auto& [name, text] : after) {
        const auto was = before[i].find(name);
        if (was == before[i].end() || was->second == text) continue;
        std::cout << opened[i].name << ": " << name << ": " << was->second << " -> " << text << '\n';
        any = true;
      }
      if (!any) std::cout << opened[i].name << ": no change\n";
      if (opened[i].created) std::filesystem::remove(opened[i].name);
    }
    std::cerr << "ovrameta: dry run: nothing was written" << std::endl;
    return;
  }
  Progress progress(opened.size(), "files written");
  reporter.SetProgress(&progress);
  std::vector<Reporter> notes(opened.size(), Reporter::Buffered());
  ForEachInOrder(
      opened.size(), Jobs(),
      [&](std::size_t i) {
        OpenedFile& file = opened[i];
        struct stat times {};
        const bool timed = options.preserveTime && ::stat(file.name.c_str(), &times) == 0;
        const std::string failure = file.batched->Flush();
        // A format that is only read says so as it stands.
        const bool readOnly = failure.rfind("can be read but not written", 0) == 0;
        if (!failure.empty()) {
          notes[i].Error(file.name, (readOnly ? "" : "cannot write file: ") + failure, kExitUsage);
          if (file.created) std::filesystem::remove(file.name);
        } else if (timed) {
          const struct timespec kept[2] = {times.st_atim, times.st_mtim};
          if (::utimensat(AT_FDCWD, file.name.c_str(), kept, 0) != 0)
            notes[i].Error(file.name, std::string("cannot keep the modification time: ") + std::strerror(errno),
                           kExitUsage);
        }
        notes[i].FlushLibrary(file.name);
      },
      [&](std::size_t i) {
        if (notes[i].status() == kExitUsage) ++failed;
        reporter.Relay(notes[i]);
        progress.Step();
      });
  progress.Clear();
  reporter.SetProgress(nullptr);
}

void PrintCount(std::size_t files, std::size_t failed, std::size_t unchanged) {
  if (failed > 0 || files > 1 || unchanged > 0) {
    const std::size_t written = files - failed - unchanged;
    std::cerr << "ovrameta: " << written << (written == 1 ? " file" : " files") << " written, "
              << (unchanged > 0 ? std::to_string(unchanged) + " unchanged, " : std::string()) << failed
              << " not written" << std::endl;
  }
}

// set --json FILE / --csv FILE: each file takes the values of its rows.
int ImportCommand(const std::string& rowsFile, bool csv, const EditOptions& options) {
  Reporter reporter;
  std::vector<Row> rows;
  std::string error;
  if (!ReadRows(rowsFile, csv, rows, error)) {
    reporter.Error(rowsFile, error, kExitUsage);
    return reporter.status();
  }
  // Every value is checked before anything is written.
  std::vector<std::string> files;
  std::vector<std::vector<Edit>> edits;
  std::set<std::string> undefined;
  for (const Row& row : rows) {
    std::vector<Edit> fileEdits;
    for (const auto& [name, value] : row.cells) {
      Edit edit;
      if (!SchemaForPrefix(name.substr(0, name.find(':')))) {
        undefined.insert(name.substr(0, name.find(':')));
        continue;
      }
      if (!ParseEdit(name + "=" + value, false, edit, error)) {
        reporter.Error(row.file, error, kExitUsage);
        continue;
      }
      fileEdits.push_back(std::move(edit));
    }
    files.push_back(row.file);
    edits.push_back(std::move(fileEdits));
  }
  for (const auto& prefix : undefined)
    reporter.Error(rowsFile, "values with the prefix " + Quoted(prefix) + " are not imported (no definition)",
                   kExitSuccess);
  if (reporter.status() != kExitSuccess) {
    std::cerr << "ovrameta: nothing was written" << std::endl;
    return reporter.status();
  }
  std::vector<OpenedFile> opened = OpenForEdit(files, reporter);
  std::size_t failed = files.size() - opened.size();
  std::vector<std::map<std::string, std::string>> before;
  std::vector<Edit> all;
  std::vector<std::size_t> ok;
  for (std::size_t i = 0, f = 0; i < files.size() && f < opened.size(); ++i) {
    if (opened[f].given != files[i]) continue;
    const std::vector<Edit>& fileEdits = edits[i];
    all.insert(all.end(), fileEdits.begin(), fileEdits.end());
    before.push_back(ReadNamed(opened[f], fileEdits));
    MetaDataUpdateAccess update(opened[f].provider);
    std::vector<Path> changes;
    const bool done = ApplyEdits(*update, fileEdits, false, changes, reporter, opened[f].name);
    if (done) {
      for (const Path& path : changes) update.AddChange(path);
      ok.push_back(f);
    } else {
      ++failed;
    }
    ++f;
  }
  std::vector<OpenedFile> toWrite;
  std::vector<std::map<std::string, std::string>> toWriteBefore;
  for (const std::size_t f : ok) {
    toWrite.push_back(opened[f]);
    toWriteBefore.push_back(before[f]);
  }
  std::size_t unchanged = 0;
  WriteEdited(toWrite, options, reporter, failed, unchanged, toWriteBefore, all);
  if (!options.dryRun) PrintCount(files.size(), failed, unchanged);
  return reporter.status();
}

}  // namespace

int SetCommand(const std::vector<std::string>& arguments, const EditOptions& options) {
  if (!options.importFile.empty()) {
    if (!arguments.empty()) {
      Reporter reporter;
      reporter.Error("", "set --json/--csv FILE takes the files and values from FILE only", kExitUsage);
      return reporter.status();
    }
    return ImportCommand(options.importFile, options.importCSV, options);
  }
  Reporter reporter;
  std::vector<std::string> files;
  std::vector<std::string> assignmentTexts;
  SplitArguments(arguments, files, assignmentTexts);
  // Files that cannot be taken count in the exit status, not in the checks
  // of what is asked: the other files are worked on.
  Reporter listing;
  files = FilesOf(files, listing);
  if (files.empty()) {
    if (listing.status() == kExitSuccess) listing.Error("", "set: no file given", kExitUsage);
    return listing.status();
  }
  if (assignmentTexts.empty() && options.deletes.empty()) {
    reporter.Error("", "set: nothing to do (give NAME=VALUE, NAME+=ITEM, NAME-=ITEM or --delete NAME)",
                   kExitUsage);
    return StatusWith(reporter, listing);
  }

  // Everything is checked before anything is written.
  std::vector<Edit> edits;
  for (const auto& text : assignmentTexts) {
    Edit edit;
    std::string error;
    if (ParseEdit(text, options.noSplit, edit, error)) {
      edits.push_back(std::move(edit));
    } else {
      reporter.Error(error.find(": refused: ") != std::string::npos ? FileList(files) : "", error, kExitUsage);
    }
  }
  for (const auto& text : options.deletes) {
    Edit edit;
    edit.kind = Edit::kDelete;
    std::string error;
    if (!ResolveName(text, edit.name, error)) {
      reporter.Error("", error, kExitUsage);
    } else if (!edit.name.language.empty()) {
      reporter.Error("", Quoted(text) + ": --delete removes a whole property, not one language", kExitUsage);
    } else {
      edits.push_back(std::move(edit));
    }
  }
  if (reporter.status() != kExitSuccess) {
    std::cerr << "ovrameta: nothing was written" << std::endl;
    return StatusWith(reporter, listing);
  }

  // A file that cannot be read is named and left out; the others are
  // written all the same.
  std::vector<OpenedFile> opened = OpenForEdit(files, reporter);
  if (opened.empty()) {
    std::cerr << "ovrameta: nothing was written" << std::endl;
    return StatusWith(reporter, listing);
  }
  std::vector<std::map<std::string, std::string>> before;
  if (options.dryRun)
    for (const auto& file : opened) before.push_back(ReadNamed(file, edits));

  std::vector<std::string> names;
  for (const auto& file : opened) names.push_back(file.name);
  const std::string context = FileList(names);
  {
    const boost::shared_ptr<MetaDataProvider> target = EditTarget(opened);
    // Every value must go in before any file is written: a change is only
    // recorded (and so written) when all of them did.
    MetaDataUpdateAccess update(target);
    std::vector<Path> changes;
    if (!*update || !ApplyEdits(*update, edits, false, changes, reporter, context)) {
      if (!*update) reporter.Error(context, "no metadata could be read", kExitUsage);
      for (const auto& file : opened)
        if (file.created) std::filesystem::remove(file.name);
      std::cerr << "ovrameta: nothing was written" << std::endl;
      return StatusWith(reporter, listing);
    }
    for (const Path& path : changes) update.AddChange(path);
  }
  // Items are added and removed file by file: each file's list decides.
  for (auto& file : opened) {
    MetaDataUpdateAccess update(file.provider);
    std::vector<Path> changes;
    ApplyEdits(*update, edits, true, changes, reporter, file.name);
    for (const Path& path : changes) update.AddChange(path);
  }
  reporter.FlushLibrary(context);

  std::size_t failed = files.size() - opened.size(), unchanged = 0;
  WriteEdited(opened, options, reporter, failed, unchanged, before, edits);
  if (options.dryRun) return StatusWith(reporter, listing);
  if (failed < files.size()) {
    std::vector<std::pair<std::string, std::string>> recent;
    for (const auto& edit : edits)
      if (edit.kind == Edit::kSet) recent.emplace_back(edit.name.name, edit.value);
    RecordRecentValues(recent);
  }
  PrintCount(files.size(), failed, unchanged);
  return StatusWith(reporter, listing);
}

// ---------------------------------------------------------------------------
// copy

int CopyCommand(const std::vector<std::string>& arguments, const EditOptions& options) {
  Reporter reporter;
  std::vector<std::string> files, nameTexts;
  SplitArguments(arguments, files, nameTexts);
  if (files.size() < 2) {
    reporter.Error("", "copy: give the file to copy from, then the files to copy to", kExitUsage);
    return reporter.status();
  }
  std::vector<Path> paths;
  for (const auto& text : nameTexts) {
    ResolvedName name;
    std::string error;
    if (!ResolveName(text, name, error) || !name.language.empty()) {
      reporter.Error("", error.empty() ? Quoted(text) + ": copy takes whole properties" : error, kExitUsage);
      continue;
    }
    paths.push_back(name.path);
  }
  if (reporter.status() != kExitSuccess) return reporter.status();
  OpenedFile source;
  if (!OpenFile(files.front(), reporter, source)) return reporter.status();
  reporter.FlushLibrary(files.front());
  {
    MetaDataReadAccess reader(source.provider);
    if (!*reader) {
      reporter.Error(files.front(), "no XMP to copy", kExitAbsent);
      return reporter.status();
    }
    if (nameTexts.empty()) {
      // Everything but the identity and history of the source document.
      for (const StoredNamespace& ns : GetStoredNamespaces(*reader)) {
        if (ns.namespaceURI == "http://ns.adobe.com/xap/1.0/mm/") continue;
        for (const StoredNode& node : GetStoredNodes(*reader, ns.namespaceURI)) {
          Path path;
          path.namespaceURI = ns.namespaceURI;
          path.description = node.name;
          path.entry_name = node.name.substr(node.name.find(':') + 1);
          path.parent_id = ns.namespaceURI;
          paths.push_back(path);
        }
      }
    }
  }
  const std::vector<std::string> targets(files.begin() + 1, files.end());
  std::vector<OpenedFile> opened = OpenForEdit(targets, reporter);
  if (opened.empty()) return reporter.status();
  std::vector<std::string> names;
  for (const auto& file : opened) names.push_back(file.name);
  {
    const boost::shared_ptr<MetaDataProvider> target = EditTarget(opened);
    MetaDataReadAccess reader(source.provider);
    MetaDataUpdateAccess update(target);
    const std::size_t reports = GetErrorInfos().size();
    const std::vector<Path> changes = CopyValues(*reader, *update, paths);
    if (GetErrorInfos().size() != reports) {
      reporter.FlushLibrary(FileList(names));
      reporter.Error(FileList(names), "not every value could be copied", kExitUsage);
      std::cerr << "ovrameta: nothing was written" << std::endl;
      return reporter.status();
    }
    if (options.dryRun) {
      for (const Path& path : changes) std::cout << FileList(names) << ": " << path.description << " would be copied\n";
      if (changes.empty()) std::cout << FileList(names) << ": no change\n";
      for (const auto& file : opened)
        if (file.created) std::filesystem::remove(file.name);
      std::cerr << "ovrameta: dry run: nothing was written" << std::endl;
      return reporter.status();
    }
    for (const Path& path : changes) update.AddChange(path);
  }
  std::size_t failed = targets.size() - opened.size(), unchanged = 0;
  WriteEdited(opened, options, reporter, failed, unchanged, {}, {});
  PrintCount(targets.size(), failed, unchanged);
  return reporter.status();
}

// ---------------------------------------------------------------------------
// schemas

namespace {

void PrintEntry(std::ostream& out, const std::string& name, const EntryDefinition& entry,
                bool internal, int depth, int nameWidth, std::set<std::string>& open,
                bool notInPanels = false);

void PrintFields(std::ostream& out, const TypeDefinition& type, int depth,
                 std::set<std::string>& open) {
  // A structure that contains itself is listed once.
  if (!open.insert(type.name).second) return;
  std::size_t width = 0;
  for (const auto& field : type.fields) {
    if (field) width = std::max(width, field->prefix.size() + 1 + field->name.size());
  }
  for (const auto& field : type.fields) {
    if (!field) continue;
    PrintEntry(out, field->prefix + ":" + field->name, *field, false, depth,
               static_cast<int>(width), open);
  }
  open.erase(type.name);
}

void PrintEntry(std::ostream& out, const std::string& name, const EntryDefinition& entry,
                bool internal, int depth, int nameWidth, std::set<std::string>& open,
                bool notInPanels) {
  const std::string indent(static_cast<std::size_t>(depth) * 2, ' ');
  std::string padded = name;
  if (static_cast<int>(padded.size()) < nameWidth) padded.append(nameWidth - padded.size(), ' ');
  out << indent << padded << "  " << TypeText(entry);
  out << "  " << LabelOr(entry.label, entry.name);
  if (internal) out << "  (internal)";
  if (notInPanels) out << "  (not shown in panels)";
  out << '\n';
  for (const auto& choice : ChoicesOf(entry)) {
    if (!choice) continue;
    const std::string label = ToUTF8(choice->label);
    out << indent << "    = " << choice->rawValue
        << (label.empty() || label == choice->rawValue ? "" : "  " + label) << '\n';
  }
  if (const auto type = PropertyTypeOf(entry)) {
    if (!type->fields.empty()) PrintFields(out, *type, depth + 1, open);
  }
}

}  // namespace

namespace {

// The schemas registered under prefixes, or every known one; false (after
// a message) when a prefix names none.
bool SchemasFor(const std::vector<std::string>& prefixes, Reporter& reporter,
                std::vector<SchemaDefinitionPtr>& schemas) {
  if (prefixes.empty()) {
    schemas = KnownSchemas();
    return true;
  }
  for (const std::string& prefix : prefixes) {
    const auto schema = SchemaForPrefix(prefix);
    if (!schema) {
      reporter.Error("", "no schema is registered with the prefix " + Quoted(prefix) +
                             " (ovrameta schemas lists them)",
                     kExitUsage);
      return false;
    }
    schemas.push_back(schema);
  }
  return true;
}

}  // namespace

int SchemasCommand(const std::vector<std::string>& prefixes, bool xml) {
  Reporter reporter;
  std::vector<SchemaDefinitionPtr> schemas;
  if (!SchemasFor(prefixes, reporter, schemas)) return reporter.status();
  if (xml) {
    // The schemas alone: the types they use are registered already.
    std::cout << WriteDefinitionsToBuffer(Range<SchemaDefinitionPtr>(schemas), Range<TypeDefinitionPtr>());
    return reporter.status();
  }
  bool first = true;
  for (const auto& schema : schemas) {
    if (!first) std::cout << '\n';
    first = false;
    std::cout << schema->prefix << "  " << schema->namespaceURI << "  "
              << LabelOr(schema->label, schema->prefix) << '\n';
    std::size_t width = 0;
    for (const auto& property : schema->properties) {
      if (property) width = std::max(width, schema->prefix.size() + 1 + property->name.size());
    }
    std::set<std::string> open;
    for (const auto& property : schema->properties) {
      if (!property) continue;
      const bool panels = IsPropertyUISupported(CreatePathFromSchemaProperty(schema, property));
      PrintEntry(std::cout, schema->prefix + ":" + property->name, *property,
                 property->isInternal, 1, static_cast<int>(width), open, !panels);
    }
  }
  return reporter.status();
}

// ---------------------------------------------------------------------------
// views

int ViewsCommand(const std::string& name) {
  Reporter reporter;
  if (!name.empty()) {
    const ViewDefinitionPtr view = GetViewDefinitionForName(name);
    if (!view) {
      reporter.Error("", "no view is named " + Quoted(name) + " (ovrameta views lists them)", kExitUsage);
      return reporter.status();
    }
    PrintViewLayout(std::cout, *view);
    return reporter.status();
  }
  for (const ViewDefinitionPtr& view : CommonViewDefinitions()) {
    const std::string source = ToUTF8(ViewDefinitionSource(view));
    // Built-in views come from resources, which have names, not paths.
    const bool builtIn = source.find('/') == std::string::npos;
    ViewItem label;
    label.label = view->label.empty() ? view->name : view->label;
    std::cout << view->name << "  " << ToUTF8(label.GetLabel()) << "  "
              << (builtIn ? "built-in (" + source + ")" : source) << '\n';
  }
  return reporter.status();
}

// ---------------------------------------------------------------------------
// packages

void SetSidecarOptions(bool always, bool fullName) {
  Sidecars().always = always;
  Sidecars().name = fullName ? SidecarName::kFull : SidecarName::kBase;
}

int PackagesCommand(const std::vector<ErrorInfo>& problems) {
  const std::vector<ExtensionPackage> packages = RegisteredExtensionPackages();
  std::cout << "Package folders:\n  " << ToUTF8(CustomExtensionsGlobalDirectory()) << "\n  "
            << ToUTF8(CustomExtensionsUserDirectory()) << '\n';
  if (packages.empty()) std::cout << "No package is registered.\n";
  for (const ExtensionPackage& package : packages) {
    std::ostringstream version;
    version << package.version;
    std::cout << ToUTF8(package.name) << "  " << version.str() << "  " << ToUTF8(package.path) << '\n';
  }
  std::vector<std::string> lines;
  for (const ErrorInfo& info : problems) {
    if (info.type != kExtensionManifestParsingError && info.type != kExtensionPackageRegistrationError) continue;
    lines.push_back(ToUTF8(info.source) + ": " + ToUTF8(info.message));
  }
  if (!lines.empty()) std::cout << "Problems:\n";
  for (const std::string& line : lines) std::cout << "  " << line << '\n';
  return kExitSuccess;
}

// ---------------------------------------------------------------------------
// views --generate

int GenerateViewCommand(const std::vector<std::string>& arguments) {
  namespace fs = std::filesystem;
  Reporter reporter;
  std::vector<SchemaDefinitionPtr> schemas;
  const std::vector<std::string> prefixes(arguments.begin() + 1, arguments.end());
  if (!SchemasFor(prefixes, reporter, schemas)) return reporter.status();
  GenericPanelManifestParser::ManifestInfo manifest;
  manifest.name = ToUTF16(arguments.front());
  // The library writes files; the tool hands the text on.
  const fs::path folder = fs::temp_directory_path() / ("ovrameta-view-" + std::to_string(::getpid()));
  const fs::path file = folder / "view.xml";
  const bool written = WriteViewDefinitionsFileFromSchema(schemas, {}, manifest, ToUTF16(file.string()));
  std::ifstream in(file, std::ios::binary);
  std::cout << in.rdbuf();
  std::error_code ec;
  fs::remove_all(folder, ec);
  if (!written) reporter.Error("", "cannot write the view file in " + folder.string(), kExitUsage);
  return reporter.status();
}

}  // namespace ovrameta
