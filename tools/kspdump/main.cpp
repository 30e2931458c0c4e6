// SPDX-License-Identifier: Apache-2.0
// kspdump: decodes captures of the controller's exports for people and programs. This file reads the command
// line.

#include <fcntl.h>
#include <getopt.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <clocale>
#include <cstdio>
#include <new>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kspdump/in_order.h"
#include "tools/kspdump/run.h"
#include "tools/kspdump/view/output.h"
#include "tools/kspdump/view/text.h"

namespace {

using namespace kspdump;

/// Sets of commands.
enum : unsigned {
  kStats = 1,
  kSummary = 2,
  kMedia = 4,
  kSnapshot = 8,
  kDiff = 16,
  kTrend = 32,
  kIdentify = 64,
  kKeys = 128,
  kMany = kStats | kSummary | kMedia,
  kDecoders = kMany | kSnapshot,
  kSeries = kDiff | kTrend,
  kSelecting = kDecoders | kSeries,
  kReading = kSelecting | kIdentify,
  kAll = kReading | kKeys,
};

struct Command {
  std::string_view name;
  const char* arguments;
  const char* summary;
  unsigned bit;
  Subject subject;
  Task task;
  /// Of its captures, where no argument tells.
  Kind kind;
};

constexpr Command kCommands[] = {
    {"stats", "SOURCE...", "Decode statistics streams", kStats, Subject::kStatistics, Task::kCaptures,
     Kind::kStats},
    {"summary", "SOURCE...", "Decode the summary block of statistics streams", kSummary, Subject::kStatistics,
     Task::kCaptures, Kind::kSummary},
    {"media", "SOURCE...", "Decode media statistics streams", kMedia, Subject::kStatistics, Task::kCaptures,
     Kind::kMedia},
    {"snapshot", "SOURCE", "Show a snapshot: the fixed layout, or a header's", kSnapshot, Subject::kSnapshot,
     Task::kCaptures, Kind::kSnapshot},
    {"diff",
     "stats|summary|media OLD NEW",
     "Show what changed between two captures",
     kDiff,
     Subject::kDifference,
     Task::kDifference,
     {}},
    {"trend",
     "stats|summary|media SOURCE...",
     "Show how values went over captures",
     kTrend,
     Subject::kTrend,
     Task::kTrend,
     {}},
    {"identify",
     "SOURCE...",
     "Tell which kind of capture each is",
     kIdentify,
     Subject::kListing,
     Task::kIdentify,
     {}},
    {"keys",
     "stats|media [GLOB]",
     "List the keys that have a name",
     kKeys,
     Subject::kListing,
     Task::kKeys,
     {}},
};

/// What the words of a command line come to before they are made into options of the program.
struct Wanted {
  const Command* command = nullptr;
  std::string_view form;
  Options options;
};

/// How an option is understood: the rest of a sentence that begins with its name and says what is wrong with
/// the value; empty when nothing is.
using Take = std::string (*)(Wanted& wanted, const std::string& value);

struct OptionRow {
  const char* name;
  /// What its value is called; null for none.
  const char* value;
  unsigned commands;
  const char* help;
  /// What holds without the option.
  const char* usual;
  Take take;
};

/// The names of a subject's forms, a blank in front of each.
std::string formNames(Subject subject) {
  std::string names;
  for (const Form* form : formsFor(subject)) names.append(" ").append(form->name);
  return names;
}

template <class Number>
bool readNumber(std::string_view text, Number& number) {
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  return error == std::errc() && end == text.data() + text.size();
}

std::string takeJobs(Wanted& wanted, const std::string& value) {
  constexpr size_t kMostJobs = 1024;
  size_t jobs = 0;
  if (!readNumber(value, jobs) || jobs < 1 || jobs > kMostJobs) return "takes a number from 1 to 1024";
  wanted.options.jobs = jobs;
  return "";
}

std::string takeSize(Wanted& wanted, const std::string& value) {
  constexpr std::string_view kUnits = "KMG";
  constexpr unsigned kUnitBits = 10;
  std::string_view number = value;
  unsigned shift = 0;
  if (const size_t unit = kUnits.find(number.back()); unit != std::string_view::npos) {
    shift = kUnitBits * static_cast<unsigned>(unit + 1);
    number.remove_suffix(1);
  }
  uint64_t size = 0;
  if (!readNumber(number, size) || size == 0 || size > Reading::kUtmostGreatest >> shift) {
    return "takes a number of bytes below 4G, K, M or G behind it or not";
  }
  wanted.options.mostBytes = size << shift;
  return "";
}

constexpr OptionRow kOptions[] = {
    {"format", "FORM", kAll, "How to show it", nullptr,
     [](Wanted& wanted, const std::string& value) -> std::string {
       wanted.form = value;
       for (const Form* form : formsFor(wanted.command->subject)) {
         if (form->name == value) {
           wanted.options.form = form;
           return "";
         }
       }
       return "knows no " + printable(value) + " here, but" + formNames(wanted.command->subject);
     }},
    {"match", "GLOB", kSelecting, "Only records whose name matches; may come again", "all",
     [](Wanted& wanted, const std::string& value) -> std::string {
       wanted.options.decoding.selection.addPattern(value);
       return "";
     }},
    {"key", "N[-M]", kSelecting, "Only records of these keys; may come again", "all",
     [](Wanted& wanted, const std::string& value) -> std::string {
       return wanted.options.decoding.selection.addKeys(value) ? "" : "takes N or N-M";
     }},
    {"ignore-case", nullptr, kSelecting | kKeys, "Match names in upper and lower case alike", "exactly",
     [](Wanted& wanted, const std::string&) -> std::string {
       wanted.options.decoding.selection.ignoreCase();
       return "";
     }},
    {"expand", nullptr, kDecoders, "In tables, a row for each element of an array",
     "on a terminal, for three records or fewer",
     [](Wanted& wanted, const std::string&) -> std::string {
       wanted.options.expands = true;
       return "";
     }},
    {"sort", "ORDER", kSeries, "By key, name, change or percent", "key",
     [](Wanted& wanted, const std::string& value) -> std::string {
       constexpr std::string_view kOrders[] = {"key", "name", "change", "percent"};
       const auto order = std::find(std::begin(kOrders), std::end(kOrders), value);
       if (order == std::end(kOrders)) return "takes key, name, change or percent";
       wanted.options.ranking.order = static_cast<Ranking::Order>(order - std::begin(kOrders));
       return "";
     }},
    {"top", "N", kSeries, "Only the first N", "all",
     [](Wanted& wanted, const std::string& value) -> std::string {
       return readNumber(value, wanted.options.ranking.most) && wanted.options.ranking.most != 0
                  ? ""
                  : "takes a number from 1 on";
     }},
    {"all", nullptr, kSeries, "Those that do not change, too", "what changes",
     [](Wanted& wanted, const std::string&) -> std::string {
       wanted.options.ranking.withUnchanged = true;
       return "";
     }},
    {"over", "NAME", kTrend, "In order of a statistic's value", "as given",
     [](Wanted& wanted, const std::string& value) -> std::string {
       wanted.options.over = value;
       return "";
     }},
    {"numbers", nullptr, kStats, "Name records by their key number", "by name",
     [](Wanted& wanted, const std::string&) -> std::string {
       wanted.options.decoding.byNumber = true;
       return "";
     }},
    {"header", "FILE", kSnapshot, "Header that describes the records", "the fixed layout",
     [](Wanted& wanted, const std::string& value) -> std::string {
       wanted.options.header = value;
       return "";
     }},
    {"label", "NAME", kReading, "What standard input is called", "-",
     [](Wanted& wanted, const std::string& value) -> std::string {
       wanted.options.label = value;
       return "";
     }},
    {"files0-from", "LIST", kMany | kTrend | kIdentify, "More sources, NUL-terminated, from a file or -",
     "none",
     [](Wanted& wanted, const std::string& value) -> std::string {
       wanted.options.sourcesFrom = value;
       return "";
     }},
    {"max-size", "SIZE", kReading, "The greatest capture that is read", "256M", takeSize},
    {"jobs", "N", kMany, "Captures decoded at a time", "one a core", takeJobs},
    {"output", "FILE", kAll, "Write to a file", "standard output",
     [](Wanted& wanted, const std::string& value) -> std::string {
       wanted.options.output = value;
       return "";
     }},
    {"force", nullptr, kAll, "Let --output replace a capture", "refuse",
     [](Wanted& wanted, const std::string&) -> std::string {
       wanted.options.overwrites = true;
       return "";
     }},
};

std::string namesOf(unsigned commands) {
  std::string names;
  for (const Command& command : kCommands) {
    if ((command.bit & commands) != 0) names.append(names.empty() ? "" : ", ").append(command.name);
  }
  return names;
}

std::string defaultForm(Subject subject) {
  const std::string first(formsFor(subject).front()->name);
  return subject == Subject::kSnapshot ? first + "; table with --match or --key" : first;
}

std::string help(const Command* command) {
  std::string text;
  const auto addLine = [&](const std::string& left, const std::string& right) {
    constexpr size_t kLeft = 24;
    text += "  " + left;
    if (left.size() >= kLeft) text += "\n  " + std::string(kLeft, ' ');
    text.append(left.size() < kLeft ? kLeft - left.size() : 0, ' ').append(right).append("\n");
  };
  if (command == nullptr) {
    text =
        "kspdump decodes captures of a flash storage controller's exports.\n\n"
        "usage: kspdump COMMAND [OPTION...] [--] SOURCE...\n\ncommands:\n";
    for (const Command& each : kCommands) {
      addLine(std::string(each.name), each.summary);
      addLine("", std::string(each.arguments));
    }
    text += "\n  kspdump COMMAND --help tells the options of each.\n";
  } else {
    text.append(command->summary).append(".\n\nusage: kspdump ").append(command->name);
    text.append(" [OPTION...] [--] ").append(command->arguments).append("\n\noptions:\n");
    for (const OptionRow& row : kOptions) {
      if ((row.commands & command->bit) == 0) continue;
      const std::string left = std::string("--") + row.name + (row.value ? std::string(" ") + row.value : "");
      if (row.usual != nullptr) {
        addLine(left, row.help);
        addLine("", std::string("(default: ") + row.usual + ")");
        continue;
      }
      addLine(left, row.help + std::string(":"));
      addLine("", formNames(command->subject).substr(1));
      addLine("", "(default: " + defaultForm(command->subject) + ")");
    }
    addLine("--help, --version", "");
  }
  return text +
         "\nSOURCE is a file, a folder, an archive, or - for standard input. Exit status:\n"
         "0 clean, 1 decoded with findings, 2 wrong usage, 3 something could not be read\n"
         "or written.\n";
}

/// Ends the program with a text that was asked for.
struct Told {
  std::string text;
};

class CommandLine {
 public:
  CommandLine(int argc, char** argv) : words_(argv, argv + argc) { wanted_.options.jobs = usableCores(); }

  /// Throws UsageError or Told.
  Options parse() {
    takeCommand();
    takeOptions();
    takeArguments();
    Options& options = wanted_.options;
    if (options.form == nullptr) {
      const bool isPart =
          wanted_.command->subject == Subject::kSnapshot && !options.decoding.selection.isEmpty();
      options.form =
          isPart ? findForm("table", Subject::kSnapshot) : formsFor(wanted_.command->subject).front();
    }
    return options;
  }

 private:
  void takeCommand() {
    const std::string known = "there are " + namesOf(kAll);
    if (words_.size() < 2) throw UsageError("a command is missing; " + known);
    const std::string_view word = words_[1];
    if (word == "--help" || word == "-h") throw Told{help(nullptr)};
    if (word == "--version") throw Told{kVersion};
    for (const Command& command : kCommands) {
      if (command.name == word) wanted_.command = &command;
    }
    if (wanted_.command != nullptr) return;
    const bool isOption = word.starts_with("-") && word != "-";
    const auto behind = std::find_if(words_.begin() + 2, words_.end(), [](std::string_view each) {
      return std::any_of(std::begin(kCommands), std::end(kCommands),
                         [&](const Command& command) { return command.name == each; });
    });
    if (isOption && behind != words_.end()) {
      throw UsageError(printable(word) + " stands in front of the command: kspdump " + *behind + " " +
                       printable(word) + " ...");
    }
    if (isOption) throw UsageError(printable(word) + " stands where a command is missing; " + known);
    throw UsageError("there is no command " + printable(word) + "; " + known);
  }

  void takeOptions() {
    constexpr int kFirst = 256;
    std::vector<option> options = {{"help", no_argument, nullptr, 'h'},
                                   {"version", no_argument, nullptr, 'v'}};
    for (const OptionRow& row : kOptions) {
      const auto number = static_cast<int>(&row - kOptions);
      options.push_back(
          {row.name, row.value != nullptr ? required_argument : no_argument, nullptr, kFirst + number});
    }
    options.push_back({});
    // The command is the program's name in what follows.
    const int count = static_cast<int>(words_.size()) - 1;
    std::vector<char*> words;
    for (size_t i = 1; i < words_.size(); ++i) words.push_back(words_[i]);
    words.push_back(nullptr);
    opterr = 0;
    for (int got = 0; (got = getopt_long(count, words.data(), ":h", options.data(), nullptr)) != -1;) {
      if (got == 'h') throw Told{help(wanted_.command)};
      if (got == 'v') throw Told{kVersion};
      if (got == ':') throw UsageError(withoutValue(kOptions[optopt - kFirst], "no"));
      if (got == '?') refuse(words[static_cast<size_t>(optind) - 1]);
      takeOption(kOptions[got - kFirst], optarg != nullptr ? optarg : "");
    }
    arguments_.assign(words.begin() + optind, words.end() - 1);
  }

  [[noreturn]] void refuse(const std::string& word) const {
    if (optopt != 0 && word.starts_with("--")) {
      throw UsageError(printable(word.substr(0, word.find('='))) + " takes no value, so not " +
                       printable(word));
    }
    const std::string option = word.starts_with("--") ? word : std::string("-") + static_cast<char>(optopt);
    throw UsageError("there is no option " + printable(option));
  }

  [[nodiscard]] std::string withoutValue(const OptionRow& row, const std::string& which) const {
    const std::string option = std::string("--") + row.name;
    std::string text = option + " has " + which + " value: " + option + " " + row.value;
    if (row.usual == nullptr) text += ", one of" + formNames(wanted_.command->subject);
    return text;
  }

  void takeOption(const OptionRow& row, const std::string& value) {
    const std::string name = std::string("--") + row.name;
    if ((row.commands & wanted_.command->bit) == 0) {
      throw UsageError(std::string(wanted_.command->name) + " has no option " + name + ", but " +
                       namesOf(row.commands) +
                       (namesOf(row.commands).find(',') == std::string::npos ? " has" : " have"));
    }
    if (row.value != nullptr && value.empty()) throw UsageError(withoutValue(row, "an empty"));
    const std::string wrong = row.take(wanted_, value);
    if (!wrong.empty()) throw UsageError(name + " " + wrong);
  }

  void takeArguments() {
    Options& options = wanted_.options;
    options.task = wanted_.command->task;
    options.decoding.kind = wanted_.command->kind;
    switch (options.task) {
      case Task::kDifference:
        takeKind("OLD NEW", kMany);
        options.sources = arguments_;
        if (arguments_.size() != 2) {
          throw UsageError("diff takes two captures, OLD NEW, but got " + listed());
        }
        return;
      case Task::kTrend:
        takeKind("SOURCE...", kMany);
        return takeSources();
      case Task::kKeys:
        takeKind("[GLOB]", kStats | kMedia);
        if (arguments_.size() > 1) throw UsageError("keys takes one pattern, but got " + listed());
        if (!arguments_.empty()) options.decoding.selection.addPattern(arguments_.front());
        return;
      default:
        takeSources();
        if (wanted_.command->bit == kSnapshot && arguments_.size() != 1) {
          throw UsageError("snapshot takes one source, but got " + listed());
        }
    }
  }

  void takeSources() {
    wanted_.options.sources = arguments_;
    if (arguments_.empty() && wanted_.options.sourcesFrom.empty()) {
      throw UsageError(std::string(wanted_.command->name) +
                       " has no source: a file, or - for standard input");
    }
    if (std::find(arguments_.begin(), arguments_.end(), "") != arguments_.end()) {
      throw UsageError("a source has an empty name");
    }
  }

  /// The word behind a command that says what is in its captures.
  void takeKind(const std::string& rest, unsigned commands) {
    const std::string command(wanted_.command->name);
    const std::string usage =
        ": kspdump " + command + " KIND " + rest + ", KIND being one of " + namesOf(commands);
    if (arguments_.empty()) throw UsageError(command + " has no kind of capture" + usage);
    const std::string word = arguments_.front();
    for (const Kind kind : {Kind::kStats, Kind::kSummary, Kind::kMedia}) {
      if (kindName(kind) != word || ((1U << static_cast<unsigned>(kind)) & commands) == 0) continue;
      wanted_.options.decoding.kind = kind;
      arguments_.erase(arguments_.begin());
      return;
    }
    throw UsageError(printable(word) + " is no kind of capture that " + command + " knows" + usage);
  }

  [[nodiscard]] std::string listed() const {
    if (arguments_.empty()) return "none";
    std::string text;
    for (const std::string& word : arguments_) text.append(text.empty() ? "" : ", ").append(printable(word));
    return text;
  }

  static constexpr const char* kVersion = "kspdump " KSP_VERSION "\n";

  std::vector<char*> words_;
  std::vector<std::string> arguments_;
  Wanted wanted_;
};

/// A closed standard stream stays unusable, instead of becoming the next file that is opened.
void keepStandardDescriptors() {
  for (int number = STDIN_FILENO; number <= STDERR_FILENO; ++number) {
    if (fcntl(number, F_GETFD) == -1) open("/dev/null", number == STDIN_FILENO ? O_WRONLY : O_RDONLY);
  }
}

int runOrTell(int argc, char** argv) {
  try {
    return run(CommandLine(argc, argv).parse());
  } catch (const Told& told) {
    Output output("");
    output.write(told.text);
    return kClean;
  } catch (const UsageError& error) {
    std::fprintf(stderr, "kspdump: %s; kspdump --help tells more\n", error.what());
    return kUsage;
  }
}

}  // namespace

int main(int argc, char** argv) {
  try {
    keepStandardDescriptors();
    std::setlocale(LC_CTYPE, "");
    return runOrTell(argc, argv);
  } catch (const std::bad_alloc&) {
    std::fputs("kspdump: out of memory\n", stderr);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "kspdump: %s\n", error.what());
  }
  return kUnreadable;
}
