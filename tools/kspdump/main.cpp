// kspdump: decodes captures of the controller's exports for people and programs.

#include <fcntl.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <clocale>
#include <cstdio>
#include <string>
#include <vector>

#include "tools/kspdump/in_order.h"
#include "tools/kspdump/run.h"
#include "tools/kspdump/view/text.h"

namespace {

using namespace kspdump;

class CommandLine {
 public:
  explicit CommandLine(Options& options) : options_(options) {
    options_.jobs = usableCores();
    app_.set_version_flag("--version", kVersion);
    app_.require_subcommand(1);
    app_.footer(
        "FILE may be - for standard input. Exit status: 0 clean, 1 decoded with findings,\n"
        "which are named on standard error, 2 wrong usage, 3 a file could not be read or\n"
        "written.");

    CLI::App* stats = addMany("stats", "Decode statistics streams", Kind::kStats);
    stats->add_flag("--numbers", options_.decoding.byNumber, "Name records by their key number");
    addMany("summary", "Decode the summary block of statistics streams", Kind::kSummary);
    addMany("media", "Decode media statistics streams", Kind::kMedia);
    CLI::App* snapshot =
        app_.add_subcommand("snapshot", "Render a snapshot: the fixed layout, or a header's");
    snapshot->add_option("FILE", options_.sources, "The capture")->required()->expected(1)->type_name("");
    snapshot->add_option("--header", options_.header, "Header that describes the records")
        ->type_name("HEADER");
    addCommon(*snapshot, Kind::kSnapshot, Subject::kSnapshot);

    CLI::App* diff = app_.add_subcommand("diff", "Show what changed between two captures");
    diff->require_subcommand(1);
    for (const auto& [name, kind] : {std::pair{"stats", Kind::kStats}, std::pair{"media", Kind::kMedia}}) {
      CLI::App* what = diff->add_subcommand(name, std::string("Compare two ") + name + " captures");
      what->add_option("OLD NEW", options_.sources, "The two captures")
          ->required()
          ->expected(2)
          ->type_name("");
      addCommon(*what, kind, Subject::kDifference);
    }
  }

  /// Returns the exit status where the program ends with its command line, else -1.
  int parse(int argc, char** argv) {
    std::vector<std::string> words(argv + 1, argv + argc);
    std::string wrong = prepare(words);
    if (wrong.empty()) {
      std::reverse(words.begin(), words.end());
      try {
        app_.parse(words);
        return -1;
      } catch (const CLI::Success& success) {
        return app_.exit(success);
      } catch (const CLI::ParseError& error) {
        wrong = error.what();
      }
    }
    std::fprintf(stderr, "kspdump: %s; kspdump --help tells more\n", printable(wrong).c_str());
    return kUsage;
  }

 private:
  /// Looks at the words for what the parser would take in another sense than people mean it: an option with
  /// nothing behind its equals sign is no option of the next word, and a file may be named like a list.
  std::string prepare(std::vector<std::string>& words) const {
    const std::string commands = "there are stats, summary, media, snapshot and diff";
    bool isValue = false;
    bool hasCommand = false;
    for (std::string& word : words) {
      if (word == "--") break;
      if (word.starts_with("--") && word.ends_with("=")) return word + " has no value";
      if (!hasCommand && !word.starts_with("-")) {
        if (std::find(std::begin(kCommands), std::end(kCommands), word) == std::end(kCommands))
          return std::string("there is no command ").append(word).append("; ").append(commands);
        hasCommand = true;
      }
      if (!isValue && (word == "++" || (word.starts_with("[") && word.ends_with("]")))) word.insert(0, "./");
      isValue = std::find(std::begin(kWithValue), std::end(kWithValue), word) != std::end(kWithValue);
    }
    return hasCommand || !words.empty() ? "" : "a command is missing; " + commands;
  }

  CLI::App* addMany(const char* name, const char* description, Kind kind) {
    CLI::App* command = app_.add_subcommand(name, description);
    command->add_option("FILE", options_.sources, "Captures")->required()->type_name("");
    command->add_option("--jobs", options_.jobs, "Files decoded at a time; all cores by default")
        ->check(CLI::Range(1, 1024))
        ->option_text("N");
    addCommon(*command, kind, Subject::kStatistics);
    return command;
  }

  void addCommon(CLI::App& command, Kind kind, Subject subject) {
    std::vector<std::string> names;
    for (const Form* form : formsFor(subject)) names.emplace_back(form->name);
    command.add_option("--format", format_, CLI::detail::join(names, ", "))
        ->check(CLI::IsMember(names))
        ->option_text("FORMAT");
    command.add_option("--match", options_.decoding.match, "Only records whose name matches the pattern")
        ->type_name("GLOB");
    command.add_option("--output", options_.output, "Write to a file instead of standard output")
        ->type_name("FILE");
    command.set_version_flag("--version", kVersion);
    command.callback([this, kind, subject] {
      options_.decoding.kind = kind;
      options_.subject = subject;
      // The report shows all of a snapshot.
      const bool isPart = subject == Subject::kSnapshot && !options_.decoding.match.empty();
      if (format_.empty()) format_ = isPart ? "table" : formsFor(subject).front()->name;
      options_.form = findForm(format_, subject);
    });
  }

  static constexpr const char* kVersion = "kspdump " KSP_VERSION;
  static constexpr const char* kCommands[] = {"stats", "summary", "media", "snapshot", "diff"};
  static constexpr const char* kWithValue[] = {"--format", "--match", "--output", "--jobs", "--header"};

  Options& options_;
  std::string format_;
  CLI::App app_{"Decodes captures of a flash storage controller's exports.", "kspdump"};
};

/// A closed standard stream stays unusable, instead of becoming the next file that is opened.
void keepStandardDescriptors() {
  for (int number = STDIN_FILENO; number <= STDERR_FILENO; ++number) {
    if (fcntl(number, F_GETFD) < 0) open("/dev/null", number == STDIN_FILENO ? O_WRONLY : O_RDONLY);
  }
}

}  // namespace

int main(int argc, char** argv) {
  try {
    keepStandardDescriptors();
    std::setlocale(LC_CTYPE, "");
    Options options;
    CommandLine commandLine(options);
    const int ended = commandLine.parse(argc, argv);
    return ended >= 0 ? ended : run(options);
  } catch (const std::bad_alloc&) {
    std::fputs("kspdump: out of memory\n", stderr);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "kspdump: %s\n", error.what());
  }
  return kUnreadable;
}
