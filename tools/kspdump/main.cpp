// kspdump: decodes captures of the controller's exports for people and programs.

#include <fcntl.h>
#include <sys/ioctl.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <chrono>
#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <thread>
#include <vector>

#include "tools/kspdump/capture.h"
#include "tools/kspdump/decode.h"
#include "tools/kspdump/diff.h"
#include "tools/kspdump/in_order.h"
#include "tools/kspdump/output.h"
#include "tools/kspdump/render.h"
#include "tools/kspdump/snapshot.h"
#include "tools/kspdump/text.h"

namespace {

using namespace kspdump;

/// Exit statuses; the greatest that applies is the program's.
enum Status : int { kClean = 0, kFindings = 1, kUsage = 2, kUnreadable = 3 };

struct Options {
  Decoding decoding;
  Format format = Format::kTable;
  std::vector<std::string> files;
  std::string header;
  std::string output;
  size_t jobs = std::max(1U, std::thread::hardware_concurrency());
  bool isDiff = false;
};

size_t terminalWidth() {
  constexpr size_t kUsual = 80;
  winsize size = {};
  if (ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col != 0) return size.ws_col;
  return kUsual;
}

/// How far many files are, on one line of a terminal that the results are not written to.
class Progress {
 public:
  Progress(size_t files, const Output& output)
      : files_(files), isWanted_(files > 1 && isatty(STDERR_FILENO) != 0 && !output.isTerminal()) {}

  void show(size_t done) {
    const auto now = std::chrono::steady_clock::now();
    if (!isWanted_ || now - last_ < std::chrono::milliseconds(100)) return;
    last_ = now;
    isShown_ = true;
    std::fprintf(stderr, "\r%zu of %zu files", done, files_);
  }

  /// Makes room for other lines.
  void hide() {
    if (isShown_) std::fputs("\r\x1b[K", stderr);
    isShown_ = false;
  }

 private:
  size_t files_;
  bool isWanted_;
  bool isShown_ = false;
  std::chrono::steady_clock::time_point last_;
};

void complain(const std::string& source, const std::string& text) {
  std::fprintf(stderr, "kspdump: %s: %s\n", printable(source).c_str(), text.c_str());
}

/// Names a capture's findings on standard error.
int tell(const Capture& capture) {
  for (const Finding& finding : capture.findings) {
    complain(capture.source, "offset " + std::to_string(finding.offset) + ": " + finding.reason);
  }
  if (capture.furtherFindings != 0) {
    complain(capture.source, std::to_string(capture.furtherFindings) + " further findings");
  }
  return capture.isClean() ? kClean : kFindings;
}

/// A file's way through the program: why it cannot be read, or what was decoded and rendered.
struct Job {
  std::string unreadable;
  Capture capture;
  std::string text;
};

/// Reads and decodes a file; of a large capture `whenMany` gets parts in between, and `whenDecoded` gets what
/// is left at the end.
template <class WhenMany, class WhenDecoded>
void decodeFile(const std::string& file, const Options& options, Job& job, WhenMany whenMany,
                WhenDecoded whenDecoded) {
  thread_local std::vector<unsigned char> bytes;
  job.text.clear();
  try {
    job.unreadable = readFile(file, bytes);
    if (!job.unreadable.empty()) return;
    Decoding decoding = options.decoding;
    decoding.whenMany = whenMany;
    decode(bytes, file, decoding, job.capture);
    whenDecoded(job.capture);
  } catch (const std::bad_alloc&) {
    // One capture too large does not stop the others.
    bytes = {};
    job = {};
    job.unreadable = "out of memory";
  }
}

/// Exit status, and whether anything was decoded that an output file could hold.
struct Result {
  int status = kClean;
  bool isDecoded = false;
};

Result dump(const Options& options, Output& output) {
  const size_t width = terminalWidth();
  const bool isAlone = options.files.size() == 1;
  Progress progress(options.files.size(), output);
  OpenMetrics metrics;
  Result result;

  if (options.format == Format::kCsv) output.write(kCsvHead);
  inOrder<Job>(
      options.files.size(), std::min(options.jobs, options.files.size()),
      [&](size_t index, Job& job) {
        CaptureRenderer renderer(options.format, width, job.text);
        const auto part = [&](Capture& capture) {
          renderer.part(capture);
          // What need not wait for its turn is not kept.
          if (isAlone) {
            output.write(job.text);
            job.text.clear();
          }
        };
        decodeFile(options.files[index], options, job, part,
                   [&](Capture& capture) { renderer.end(capture); });
      },
      [&](size_t index, Job& job) {
        if (!job.unreadable.empty()) {
          progress.hide();
          complain(options.files[index], "cannot be read: " + job.unreadable);
          result.status = kUnreadable;
        } else {
          if (options.format == Format::kOpenMetrics) metrics.add(job.capture);
          if (options.format == Format::kTable && result.isDecoded) output.write("\n");
          result.isDecoded = true;
          output.write(job.text);
          if (!job.capture.isClean()) progress.hide();
          result.status = std::max(result.status, tell(job.capture));
        }
        progress.show(index + 1);
      });
  progress.hide();
  if (options.format == Format::kOpenMetrics) output.write(metrics.text());
  return result;
}

Result diff(const Options& options, Output& output) {
  Job jobs[2];
  Result result = {.status = kClean, .isDecoded = true};
  for (size_t i = 0; i < 2; ++i) {
    const auto ignore = [](Capture&) {};
    decodeFile(options.files[i], options, jobs[i], ignore, ignore);
    if (jobs[i].unreadable.empty()) {
      result.status = std::max(result.status, tell(jobs[i].capture));
    } else {
      complain(options.files[i], "cannot be read: " + jobs[i].unreadable);
      result = {.status = kUnreadable, .isDecoded = false};
    }
  }
  if (result.isDecoded) {
    output.write(renderDiff(jobs[0].capture, jobs[1].capture, options.format, terminalWidth()));
  }
  return result;
}

/// Writes a snapshot's text report. The header's title and formats come from the device, so nothing but lines
/// is let through of them.
Result report(const Options& options, Output& output) {
  const std::string& file = options.files.front();
  std::vector<unsigned char> bytes;
  const std::string unreadable = readFile(file, bytes);
  if (!unreadable.empty()) {
    complain(file, "cannot be read: " + unreadable);
    return {.status = kUnreadable, .isDecoded = false};
  }
  Capture capture;
  capture.source = file;
  findSnapshotFaults(capture, bytes, options.decoding.header);
  reportSnapshot(capture, bytes, options.decoding.header, [&](std::string_view text) {
    if (options.decoding.header.empty()) return output.write(text);
    for (size_t end = text.find('\n'); end != std::string_view::npos; end = text.find('\n')) {
      output.write(printable(text.substr(0, end)) + "\n");
      text.remove_prefix(end + 1);
    }
  });
  return {.status = tell(capture), .isDecoded = true};
}

int run(Options& options) {
  std::vector<unsigned char> header;
  if (!options.header.empty()) {
    std::string fault = readFile(options.header, header);
    if (!fault.empty()) {
      fault = "cannot be read: " + fault;
    } else if (const char* wrong = headerFault(header)) {
      fault = std::string("the header ") + wrong;
    }
    if (!fault.empty()) {
      complain(options.header, fault);
      return kUnreadable;
    }
    options.decoding.header = header;
  }
  Output output(options.output);
  // The report is a snapshot's table, unless it is only some of the fields that are asked for.
  const bool asReport = options.decoding.kind == Kind::kSnapshot && options.format == Format::kTable &&
                        options.decoding.match.empty();
  const Result result = options.isDiff ? diff(options, output)
                        : asReport     ? report(options, output)
                                       : dump(options, output);
  if (result.isDecoded) output.finish();
  return result.status;
}

class CommandLine {
 public:
  explicit CommandLine(Options& options) : options_(options) {
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
    snapshot->add_option("FILE", options_.files, "The capture")->required()->expected(1)->type_name("");
    snapshot->add_option("--header", options_.header, "Header that describes the records")
        ->type_name("HEADER");
    addCommon(*snapshot, Kind::kSnapshot);

    CLI::App* diff = app_.add_subcommand("diff", "Show what changed between two captures");
    diff->require_subcommand(1);
    for (const auto& [name, kind] : {std::pair{"stats", Kind::kStats}, std::pair{"media", Kind::kMedia}}) {
      CLI::App* what = diff->add_subcommand(name, std::string("Compare two ") + name + " captures");
      what->add_option("OLD NEW", options_.files, "The two captures")->required()->expected(2)->type_name("");
      addCommon(*what, kind);
      what->parse_complete_callback([this] { options_.isDiff = true; });
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
    command->add_option("FILE", options_.files, "Captures")->required()->type_name("");
    command->add_option("--jobs", options_.jobs, "Files decoded at a time; all cores by default")
        ->check(CLI::Range(1, 1024))
        ->option_text("N");
    addCommon(*command, kind);
    return command;
  }

  void addCommon(CLI::App& command, Kind kind) {
    command.add_option("--format", format_, "table, json, csv or openmetrics")
        ->check(CLI::IsMember(std::vector<std::string>(std::begin(kFormatNames), std::end(kFormatNames))))
        ->option_text("FORMAT");
    command.add_option("--match", options_.decoding.match, "Only records whose name matches the pattern")
        ->type_name("GLOB");
    command.add_option("--output", options_.output, "Write to a file instead of standard output")
        ->type_name("FILE");
    command.set_version_flag("--version", kVersion);
    command.callback([this, kind] {
      options_.decoding.kind = kind;
      options_.format = static_cast<Format>(
          std::find(std::begin(kFormatNames), std::end(kFormatNames), format_) - std::begin(kFormatNames));
    });
  }

  static constexpr const char* kVersion = "kspdump " KSP_VERSION;
  static constexpr const char* kCommands[] = {"stats", "summary", "media", "snapshot", "diff"};
  static constexpr const char* kWithValue[] = {"--format", "--match", "--output", "--jobs", "--header"};
  /// In the order of Format.
  static constexpr const char* kFormatNames[] = {"table", "json", "csv", "openmetrics"};

  Options& options_;
  std::string format_ = kFormatNames[0];
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
