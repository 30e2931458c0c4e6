// SPDX-License-Identifier: Apache-2.0
// The way of a capture through the rooms: from its source by way of a decoder and a view to the output.

#include "tools/kspdump/run.h"

#include <sys/ioctl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <charconv>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <new>

#include "ksp/records.hpp"
#include "tools/kspdump/decode/recognise.h"
#include "tools/kspdump/decode/snapshot.h"
#include "tools/kspdump/in_order.h"
#include "tools/kspdump/source/source.h"
#include "tools/kspdump/view/output.h"
#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

/// Columns of the terminal that the results go to or, where there is none, as the environment says.
size_t lineWidth() {
  constexpr size_t kUsual = 80;
  winsize size = {};
  ioctl(STDOUT_FILENO, TIOCGWINSZ, &size);
  if (size.ws_col != 0) return size.ws_col;
  const char* const columns = std::getenv("COLUMNS");
  const std::string_view text = columns != nullptr ? columns : "";
  uint16_t width = 0;  // no line is longer than a terminal's can be
  std::from_chars(text.data(), text.data() + text.size(), width);
  return width == 0 ? kUsual : width;
}

/// How many captures are shown, on one line of a terminal that the results are not written to.
class Progress {
 public:
  explicit Progress(const Output& output)
      : isWanted_(isatty(STDERR_FILENO) != 0 && !output.isTerminal()),
        last_(std::chrono::steady_clock::now()) {}

  void show() {
    ++done_;
    if (!isWanted_) return;
    const auto now = std::chrono::steady_clock::now();
    if (now - last_ < std::chrono::milliseconds(100)) return;
    last_ = now;
    isShown_ = true;
    std::fprintf(stderr, "\r%s", counted(done_, "capture").c_str());
  }

  /// Makes room for other lines.
  void hide() {
    if (isShown_) std::fputs("\r\x1b[K", stderr);
    isShown_ = false;
  }

 private:
  size_t done_ = 0;
  bool isWanted_;
  bool isShown_ = false;
  std::chrono::steady_clock::time_point last_;
};

void complain(const std::string& source, const std::string& text) {
  std::fprintf(stderr, "kspdump: %s: %s\n", printable(source).c_str(), printable(text).c_str());
}

/// Names a capture's findings on standard error.
void tell(const std::string& source, const std::vector<Finding>& findings, uint64_t further) {
  for (const Finding& finding : findings) {
    complain(source, "offset " + std::to_string(finding.offset) + ": " + finding.reason);
  }
  if (further != 0) complain(source, counted(further, "further finding"));
}

/// Exit status, and whether anything was decoded that an output file could hold.
struct Result {
  int status = kClean;
  bool isDecoded = false;
};

/// How captures are read, as the options say.
Reading readingOf(const Options& options) {
  // Whether bytes fit a header, which may describe any layout, cannot be told.
  const bool isTold = options.decoding.header.empty();
  return {.greatest = options.mostBytes,
          .isCapture = [kind = options.decoding.kind,
                        isTold](Bytes bytes) { return isTold && recognise(bytes, kind).isEnough(); },
          .keepsOthers = !isTold};
}

std::unique_ptr<Source> sourcesOf(const Options& options) {
  std::vector<std::unique_ptr<Source>> sources;
  sources.push_back(std::make_unique<Names>(options.sources, options.label.empty() ? "-" : options.label));
  if (!options.sourcesFrom.empty()) sources.push_back(namesFrom(options.sourcesFrom));
  return joined(std::move(sources));
}

/// Shows the captures of all sources: each thread by a view of its own, with another one around all of them.
class Captures {
 public:
  Captures(const Options& options, const ViewOptions& viewOptions, Output& output)
      : options_(options),
        viewOptions_(viewOptions),
        output_(output),
        progress_(output),
        framing_(options.form->make(viewOptions, frame_)) {}

  Result show() {
    framing_->head();
    const Work work = {.reading = readingOf(options_),
                       .jobs = options_.jobs,
                       .makeShow = [&](Lane& lane) { return makeShow(lane); },
                       .write = [&](std::string_view text) { write(text); },
                       .found = [&](const Found& found) { tellFound(found); }};
    showInOrder(sourcesOf(options_), work);
    progress_.hide();
    framing_->tail();
    write("");
    return result_;
  }

 private:
  /// Writes what stands around the captures, and then their text.
  void write(std::string_view text) {
    if (!frame_.text.empty()) output_.write(frame_.text);
    frame_.text.clear();
    if (!text.empty()) output_.write(text);
  }

  ShowInput makeShow(Lane& lane) {
    struct Job {
      std::unique_ptr<View> view;
      Capture capture;
      Batch batch;
    };
    const auto job = std::make_shared<Job>();
    job->view = options_.form->make(viewOptions_, lane.sink);
    return [this, job, &lane](Input& input) {
      if (input.state == Input::State::kFault) return tellFault(lane, input.name, input.fault);
      lane.then([this] { beginOne(); });
      Capture& capture = job->capture;
      capture.source = input.name;
      capture.bytes = input.bytes;
      try {
        kspdump::show(options_.decoding, capture, job->batch, *job->view);
      } catch (const std::bad_alloc&) {
        // One capture too large does not stop the others, and leaves nothing to them.
        capture = {};
        job->view = options_.form->make(viewOptions_, lane.sink);
        return tellFault(lane, input.name, "out of memory");
      }
      if (!capture.isClean()) tellFindings(lane, capture);
      lane.then([this] { progress_.show(); });
    };
  }

  void beginOne() {
    if (result_.isDecoded) framing_->between();
    result_.isDecoded = true;
  }

  void tellFault(Lane& lane, const std::string& name, const std::string& fault) {
    lane.then([this, name, fault] {
      progress_.hide();
      complain(name, "cannot be read: " + fault);
      result_.status = kUnreadable;
    });
  }

  void tellFindings(Lane& lane, const Capture& capture) {
    lane.then([this, tells = !framing_->showsFindings(), source = capture.source, findings = capture.findings,
               further = capture.furtherFindings] {
      progress_.hide();
      result_.status = std::max<int>(result_.status, kFindings);
      if (tells) tell(source, findings, further);
    });
  }

  void tellFound(const Found& found) {
    if (found.passedOver == 0 && found.captures != 0) return;
    progress_.hide();
    const std::string kind(kindTitle(options_.decoding.kind));
    if (found.captures == 0) {
      complain(found.name, "holds no " + kind + " capture");
      result_.status = std::max<int>(result_.status, kFindings);
    } else {
      complain(found.name, "passed over " + counted(found.passedOver, "file") + " that " +
                               (found.passedOver == 1 ? "is" : "are") + " no " + kind + " capture");
    }
  }

  const Options& options_;
  const ViewOptions& viewOptions_;
  Output& output_;
  Progress progress_;
  Sink frame_;
  std::unique_ptr<View> framing_;
  Result result_;
};

Result showCaptures(const Options& options, const ViewOptions& viewOptions, Output& output) {
  return Captures(options, viewOptions, output).show();
}

/// Captures in a row, as they are read.
class Row {
 public:
  Row(const Options& options, bool showsFindings) : options_(options), showsFindings_(showsFindings) {}

  void add(const Input& input) {
    if (input.state == Input::State::kFault) {
      complain(input.name, "cannot be read: " + input.fault);
      isUnreadable_ = true;
      return;
    }
    Capture capture;
    capture.source = input.name;
    capture.kind = options_.decoding.kind;
    capture.bytes = input.bytes;
    std::optional<uint64_t> over;
    if (!options_.over.empty()) over = valueOver(capture);
    const bool isLeftOut = !options_.over.empty() && !over;
    Series* const series = isLeftOut ? nullptr : &series_;
    if (series != nullptr) series->begin(capture);
    decode(options_.decoding, capture, batch_, [&](std::span<const Record> records) {
      if (series != nullptr) series->records(records);
    });
    if (isLeftOut) {
      capture.findings.insert(capture.findings.begin(),
                              {0, "there is no value of " + options_.over + " in it; it is left out"});
      capture.bytes = {};
      leftOut_.push_back(capture);
    }
    if (series != nullptr) series->end(capture);
    if (over) over_.values.push_back(*over);
    if (capture.isClean()) return;
    hasFindings_ = true;
    if (!showsFindings_) tell(capture.source, capture.findings, capture.furtherFindings);
  }

  /// Throws UsageError where there are fewer than two.
  Series& finish() {
    const size_t points = series_.points();
    if (points < 2) {
      // Nothing is shown that could have them.
      for (const Capture& capture : leftOut_) {
        if (showsFindings_) tell(capture.source, capture.findings, capture.furtherFindings);
      }
      throw UsageError("a trend takes two captures or more, but got " + counted(points, "capture"));
    }
    series_.rank(options_.ranking);
    if (!options_.over.empty()) {
      over_.name = options_.over;
      series_.goOver(over_, leftOut_);
    }
    return series_;
  }

  [[nodiscard]] bool isUnreadable() const { return isUnreadable_; }
  [[nodiscard]] int status() const { return isUnreadable_ ? kUnreadable : hasFindings_ ? kFindings : kClean; }

 private:
  /// The value of the statistic that the series goes over, selected or not.
  std::optional<uint64_t> valueOver(Capture capture) {
    std::optional<uint64_t> value;
    Decoding all = options_.decoding;
    all.selection = {};
    decode(all, capture, batch_, [&](std::span<const Record> records) {
      for (const Record& record : records) {
        if (record.name == options_.over && !record.isArray && !record.values.empty())
          value = record.values[0];
      }
    });
    return value;
  }

  const Options& options_;
  bool showsFindings_;
  Batch batch_;
  Series series_;
  Over over_;
  std::vector<Capture> leftOut_;
  bool isUnreadable_ = false;
  bool hasFindings_ = false;
};

Result showSeries(const Options& options, const ViewOptions& viewOptions, Output& output) {
  Sink sink;
  sink.drain = [&](std::string& text) {
    output.write(text);
    text.clear();
  };
  const std::unique_ptr<View> view = options.form->make(viewOptions, sink);
  Row row(options, view->showsFindings());
  if (options.task == Task::kDifference) {
    for (const std::string& source : options.sources) {
      Input input = loadOne(source, readingOf(options));
      row.add(input);
    }
    if (row.isUnreadable()) return {.status = row.status(), .isDecoded = false};
    view->difference(row.finish());
  } else {
    showInOrder(sourcesOf(options),
                {.reading = readingOf(options),
                 .jobs = 1,
                 .makeShow = [&](Lane&) -> ShowInput { return [&](Input& input) { row.add(input); }; },
                 .write = [](std::string_view) {},
                 .found = [](const Found&) {}});
    view->trend(row.finish());
  }
  sink.drain(sink.text);
  return {.status = row.status(), .isDecoded = true};
}

/// The keys of one stream's table that are selected.
void addKeys(Listing& listing, std::span<const ksp::KeyEntry> rows, const Selection& selection,
             std::vector<bool>& used) {
  for (const ksp::KeyEntry& row : rows) {
    const std::string_view name = row.name;
    if (!selection.selects(name, row.key, used)) continue;
    listing.rows.push_back({uint64_t{row.key}, std::string(name), uint64_t{row.count}, uint64_t{row.width}});
  }
}

Result listKeys(const Options& options, const ViewOptions& viewOptions, Output& output) {
  const Selection& selection = options.decoding.selection;
  Listing listing = {{{"key", ""}, {"name", ""}, {"elements", ""}, {"width", ""}}, {}};
  std::vector<bool> used(selection.size());
  if (options.decoding.kind == Kind::kMedia) {
    addKeys(listing, ksp::mspKeyTable, selection, used);
  } else {
    addKeys(listing, ksp::kStatsKeys, selection, used);
  }
  Sink sink;
  options.form->make(viewOptions, sink)->listing(listing);
  output.write(sink.text);
  if (!listing.rows.empty()) return {.status = kClean, .isDecoded = true};
  std::fprintf(stderr, "kspdump: %s\n", printable(selection.text(0) + " selects nothing").c_str());
  return {.status = kFindings, .isDecoded = true};
}

/// Lists what each capture is, those of folders and archives too.
Result identifyCaptures(const Options& options, const ViewOptions& viewOptions, Output& output) {
  Listing listing = {{{"source", ""}, {"kind", ""}, {"recognised", " %"}, {"bytes", ""}}, {}};
  Result result;
  const auto add = [&](const std::string& name, const std::optional<Recognised>& recognised, uint64_t bytes) {
    result.isDecoded = true;
    if (!recognised) result.status = std::max<int>(result.status, kFindings);
    listing.rows.push_back({name, std::string(recognised ? kindName(recognised->kind) : "unknown"),
                            uint64_t{recognised ? recognised->share.percent() : 0}, bytes});
  };
  const auto makeShow = [&](Lane& lane) -> ShowInput {
    return [&](Input& input) {
      if (input.state == Input::State::kFault) {
        return lane.then([&result, name = input.name, fault = input.fault] {
          complain(name, "cannot be read: " + fault);
          result.status = kUnreadable;
        });
      }
      lane.then([&add, name = input.name, recognised = identify(input.bytes), bytes = input.bytes.size()] {
        add(name, recognised, bytes);
      });
    };
  };
  showInOrder(sourcesOf(options),
              {.reading = {.greatest = options.mostBytes,
                           .isCapture = [](Bytes bytes) { return identify(bytes).has_value(); },
                           .keepsOthers = true},
               .jobs = options.jobs,
               .makeShow = makeShow,
               .write = [](std::string_view) {},
               .found = [](const Found&) {}});
  if (!result.isDecoded) return result;
  Sink sink;
  options.form->make(viewOptions, sink)->listing(listing);
  output.write(sink.text);
  return result;
}

/// Whether a path, or what a descriptor is of, is the file that `status` is of.
bool isSame(const struct stat& status, const std::string& path) {
  struct stat other = {};
  const bool exists = path == "-" ? fstat(STDIN_FILENO, &other) == 0 : stat(path.c_str(), &other) == 0;
  return exists && other.st_dev == status.st_dev && other.st_ino == status.st_ino;
}

/// Throws UsageError where writing the output would destroy what is read, or another capture.
void guardOutput(const Options& options) {
  struct stat status = {};
  if (options.output.empty() || options.output == "-" || stat(options.output.c_str(), &status) != 0 ||
      !S_ISREG(status.st_mode)) {
    return;
  }
  const std::string name = "--output " + printable(options.output);
  std::vector<std::string> inputs = options.sources;
  for (const std::string& input : {options.header, options.sourcesFrom}) {
    if (!input.empty()) inputs.push_back(input);
  }
  for (const std::string& input : inputs) {
    if (isSame(status, input)) throw UsageError(name + " is what is read as " + printable(input));
  }
  if (options.overwrites) return;
  Buffer bytes;
  if (!readFile(options.output, bytes, {.greatest = Reading::kUtmostGreatest}).empty()) return;
  if (const auto recognised = identify(bytes)) {
    throw UsageError(name + " holds a capture (" + std::string(kindTitle(recognised->kind)) +
                     "), which only --force lets it replace");
  }
}

}  // namespace

int run(const Options& asked) {
  Options options = asked;
  guardOutput(options);
  Buffer header;
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
  const ViewOptions viewOptions = {.width = lineWidth(),
                                   .isTerminal = output.isTerminal(),
                                   .expands = options.expands,
                                   .isSnapshot = options.decoding.kind == Kind::kSnapshot};
  const auto task = [&] {
    switch (options.task) {
      case Task::kKeys:
        return listKeys;
      case Task::kIdentify:
        return identifyCaptures;
      case Task::kDifference:
      case Task::kTrend:
        return showSeries;
      default:
        return showCaptures;
    }
  }();
  const Result result = task(options, viewOptions, output);
  if (result.isDecoded) output.finish();
  return result.status;
}

}  // namespace kspdump
