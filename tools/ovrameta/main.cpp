// ovrameta: shows and edits the XMP metadata of media files through
// ovrametadata, the way a host application does.
#include <csignal>
#include <filesystem>
#include <iostream>
#include <string>
#include <vector>

#include <CLI/CLI.hpp>
#include <ovrametadata/MetadataUtils.h>

#include "Commands.h"
#include "Files.h"
#include "Lists.h"
#include "Names.h"
#include "Parallel.h"
#include "ViewShow.h"

namespace {

// An interrupted run leaves no half-made file behind: the library removes
// the new files of writes in progress, then the signal ends the process.
extern "C" void OnTerminatingSignal(int signal) {
  ovrametadata::utility::RemoveUnfinishedWrites();
  std::signal(signal, SIG_DFL);
  std::raise(signal);
}

}  // namespace

int main(int argc, char** argv) {
  for (int signal : {SIGINT, SIGTERM, SIGHUP}) std::signal(signal, OnTerminatingSignal);
  // Output goes through std::cout only.
  std::ios::sync_with_stdio(false);
  // Named here: usage and messages would otherwise show argv[0], the path it was run by.
  CLI::App app{"Shows and edits the XMP metadata of media files.", "ovrameta"};
  app.set_version_flag("--version", "ovrameta " OVRAMETA_VERSION);
  app.require_subcommand(1);
  app.failure_message([](const CLI::App*, const CLI::Error& error) {
    return "ovrameta: " + std::string(error.what()) + "\nRun 'ovrameta --help' for more information.\n";
  });
  // Options of the tool itself are also accepted after the command.
  app.fallthrough();
  unsigned jobs = 0;
  app.add_option("-j,--jobs", jobs,
                 "Files worked on at the same time (default: one per core, at most 8)")
      ->check(CLI::Range(1u, ovrameta::kMaxJobs));
  bool sidecar = false;
  std::string sidecarName = "base";
  app.add_flag("--sidecar", sidecar,
               "Read and write the XMP sidecar beside each file (made when missing); camera raw files always "
               "take their edits there");
  app.add_option("--sidecar-name", sidecarName, "The name of a new sidecar: base (photo.xmp) or full (photo.cr3.xmp)")
      ->check(CLI::IsMember({"base", "full"}));
  app.footer(
      "Names are prefix:Property, prefix:Struct/prefix:Field or prefix:Array[n].\n"
      "Exit status: 0 success, 1 a named value is absent, 2 usage error or a file that cannot\n"
      "be read or written.");

  // Every command that takes files walks folders and reads lists alike.
  ovrameta::FileOptions fileOptions;
  const auto takesFiles = [&](CLI::App* command) {
    auto* recursive =
        command->add_flag("-r,--recursive", fileOptions.recursive, "Take the files below the folders given");
    command->add_option("--ext", fileOptions.extensions, "Only these endings from folders: jpg,mp4")
        ->type_name("EXT,...")
        ->allow_extra_args(false)
        ->delimiter(',')
        ->needs(recursive);
    command->add_option("-@,--files-from", fileOptions.lists,
                        "Also the files named in FILE, one a line (- for standard input)")
        ->type_name("FILE")
        ->allow_extra_args(false);
  };

  std::vector<std::string> showFiles;
  bool each = false;
  auto* show = app.add_subcommand(
      "show", "Show every value: of one file, or of several files as one aggregate");
  // Required unless a list names them (checked after parsing).
  show->add_option("FILE", showFiles, "Media files or, with -r, folders");
  takesFiles(show);
  show->add_flag("--each", each, "Show several files one by one instead of as an aggregate");
  std::string viewName;
  show->add_option("--view", viewName, "Show the values as this view lays them out (see views)");
  std::string fieldList;
  show->add_option("--fields", fieldList, "Show only the fields of this path list (see fields)");

  std::vector<std::string> getArguments;
  ovrameta::GetOptions getOptions;
  auto* get = app.add_subcommand("get", "Show the display value of named properties");
  get->add_option("ARGS", getArguments, "FILE... NAME...")->required();
  takesFiles(get);
  get->add_flag("--raw", getOptions.raw, "The stored text instead of the display value");
  get->add_flag("--json", getOptions.json,
                "Machine-readable output with types (all properties when no NAME is given)");
  get->add_flag("--csv", getOptions.csv,
                "One CSV row per file of stored values (all properties when no NAME is given), for set --csv");

  std::vector<std::string> setArguments;
  ovrameta::EditOptions editOptions;
  std::string importJson, importCsv;
  auto* set = app.add_subcommand("set", "Write values, checked against the definitions");
  set->add_option("ARGS", setArguments, "FILE... NAME=VALUE... (NAME+=ITEM, NAME-=ITEM for lists)");
  takesFiles(set);
  set->add_option("--delete", editOptions.deletes, "Delete the value of NAME")->expected(1, -1);
  set->add_option("--json", importJson, "Apply the values of a JSON file (as get --json writes) to the files it names");
  set->add_option("--csv", importCsv, "Apply the rows of a CSV file (as get --csv writes) to the files they name");
  set->add_flag("--no-split", editOptions.noSplit, "A list value is one item, even with \"; \" in it");
  set->add_flag("--dry-run", editOptions.dryRun, "Print per file what would change; write nothing");

  std::vector<std::string> copyArguments;
  auto* copy = app.add_subcommand("copy", "Copy the XMP of one file, or the named properties, to other files");
  copy->add_option("ARGS", copyArguments, "SOURCE TARGET... [NAME...]")->required();
  copy->add_flag("--dry-run", editOptions.dryRun, "Print what would be copied; write nothing");
  for (auto* editing : {set, copy})
    editing->add_flag("-P,--preserve-time", editOptions.preserveTime, "Keep each file's modification time");

  std::vector<std::string> schemaPrefixes;
  bool schemasXml = false;
  auto* schemas = app.add_subcommand("schemas", "List the registered schemas and their properties");
  schemas->add_option("PREFIX", schemaPrefixes, "Only the schemas with these prefixes");
  schemas->add_flag("--xml", schemasXml,
                    "Write the schemas as a definitions file (a start for a custom schema)");

  std::string viewsName;
  auto* views = app.add_subcommand("views", "List the registered views, or show the layout of one");
  views->add_option("NAME", viewsName, "The view whose layout to show");
  std::vector<std::string> generatePrefixes;
  views->add_option("--generate", generatePrefixes,
                    "NAME PREFIX...: write a view file named NAME showing those schemas")
      ->expected(2, -1);

  auto* packages = app.add_subcommand("packages", "List the extension packages and the problems found in them");

  std::string recentName;
  bool recentClear = false;
  auto* recent = app.add_subcommand("recent", "The values set recently, per property");
  recent->add_option("NAME", recentName, "Only this property's values");
  recent->add_flag("--clear", recentClear, "Forget every recent value");

  std::vector<std::string> fieldNames;
  auto* fields = app.add_subcommand("fields", "Write a path list of the fields below properties (for show --fields)");
  fields->add_option("NAME", fieldNames, "Properties")->required();

  // ExifTool's tag arguments (-Title=x) would read as unknown options: they
  // are taken out and answered once the schemas are loaded.
  std::vector<std::string> exifToolForms;
  std::vector<char*> arguments;
  for (int i = 0; i < argc; ++i) {
    // What follows "--" is taken as it is.
    if (std::string(argv[i]) == "--") {
      arguments.insert(arguments.end(), argv + i, argv + argc);
      break;
    }
    std::error_code error;
    if (i > 0 && argv[i][0] == '-' && ovrameta::IsExifToolForm(argv[i]) &&
        !std::filesystem::exists(argv[i], error)) {
      exifToolForms.push_back(argv[i]);
    } else {
      arguments.push_back(argv[i]);
    }
  }
  try {
    app.parse(static_cast<int>(arguments.size()), arguments.data());
    if (*show && showFiles.empty() && fileOptions.lists.empty()) throw CLI::RequiredError("FILE");
  } catch (const CLI::ParseError& error) {
    // Answering ExifTool's forms says more than the usage error they cause.
    if (exifToolForms.empty() || error.get_exit_code() == 0) {
      const int status = app.exit(error);
      return status == 0 ? 0 : ovrameta::kExitUsage;
    }
  }

  if (jobs != 0) ovrameta::SetJobs(jobs);
  ovrameta::SetSidecarOptions(sidecar, sidecarName == "full");
  if (!importJson.empty() || !importCsv.empty()) {
    editOptions.importFile = importJson.empty() ? importCsv : importJson;
    editOptions.importCSV = importJson.empty();
  }
  ovrameta::SetFileOptions(fileOptions);
  ovrameta::Session session;
  if (!session.ok()) return ovrameta::kExitUsage;
  // Packages may bring schemas, so every command loads them.
  const auto problems = ovrameta::LoadViews(static_cast<bool>(*packages));
  // Without the dash (Rating=3) the form is answered only when a property
  // is close: the argument may be meant otherwise.
  for (const std::string& argument : *get ? getArguments : setArguments) {
    std::error_code error;
    if ((*get || *set) && ovrameta::IsExifToolForm(argument) && !std::filesystem::exists(argument, error) &&
        !ovrameta::ExifToolAnswer(argument).empty())
      exifToolForms.push_back(argument);
  }
  for (const std::string& argument : exifToolForms)
    std::cerr << "ovrameta: " << ovrameta::ExifToolAnswer(argument) << '\n';
  if (!exifToolForms.empty()) return ovrameta::kExitUsage;
  if (*packages) return ovrameta::PackagesCommand(problems);
  if (*show) return ovrameta::ShowCommand(showFiles, each, viewName, fieldList);
  if (*recent) return ovrameta::RecentCommand(recentName, recentClear);
  if (*fields) return ovrameta::FieldsCommand(fieldNames);
  if (*views && !generatePrefixes.empty()) return ovrameta::GenerateViewCommand(generatePrefixes);
  if (*views) return ovrameta::ViewsCommand(viewsName);
  if (*get) return ovrameta::GetCommand(getArguments, getOptions);
  if (*set) return ovrameta::SetCommand(setArguments, editOptions);
  if (*copy) return ovrameta::CopyCommand(copyArguments, editOptions);
  if (*schemas) return ovrameta::SchemasCommand(schemaPrefixes, schemasXml);
  return ovrameta::kExitUsage;
}
