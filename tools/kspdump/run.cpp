// The way of a capture through the rooms: from its source by way of a decoder and a view to the output.

#include "tools/kspdump/run.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <memory>
#include <new>

#include "tools/kspdump/decode/recognise.h"
#include "tools/kspdump/decode/snapshot.h"
#include "tools/kspdump/in_order.h"
#include "tools/kspdump/source/source.h"
#include "tools/kspdump/view/output.h"
#include "tools/kspdump/view/text.h"

namespace kspdump {

namespace {

size_t terminalWidth() {
  constexpr size_t kUsual = 80;
  winsize size = {};
  if (ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col != 0) return size.ws_col;
  return kUsual;
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
    std::fprintf(stderr, "\r%zu captures", done_);
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
  std::fprintf(stderr, "kspdump: %s: %s\n", printable(source).c_str(), text.c_str());
}

/// Names a capture's findings on standard error.
void tell(const std::string& source, const std::vector<Finding>& findings, uint64_t further) {
  for (const Finding& finding : findings) {
    complain(source, "offset " + std::to_string(finding.offset) + ": " + finding.reason);
  }
  if (further != 0) complain(source, std::to_string(further) + " further findings");
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
    };
    const auto job = std::make_shared<Job>(Job{options_.form->make(viewOptions_, lane.sink), {}});
    return [this, job, &lane](Input& input) {
      if (input.state == Input::State::kFault) return tellFault(lane, input.name, input.fault);
      lane.then([this] { beginOne(); });
      Capture& capture = job->capture;
      capture.source = input.name;
      capture.bytes = input.bytes;
      try {
        kspdump::show(options_.decoding, capture, *job->view);
      } catch (const std::bad_alloc&) {
        // One capture too large does not stop the others.
        capture = {};
        return tellFault(lane, input.name, "out of memory");
      }
      if (capture.isClean()) {
        lane.then([this] { progress_.show(); });
      } else {
        tellFindings(lane, capture);
      }
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

Result showSeries(const Options& options, const ViewOptions& viewOptions, Output& output) {
  Sink sink;
  sink.drain = [&](std::string& text) {
    output.write(text);
    text.clear();
  };
  const std::unique_ptr<View> view = options.form->make(viewOptions, sink);
  Series series;
  Result result = {.status = kClean, .isDecoded = true};
  Input input;
  for (const std::string& source : options.sources) {
    input.fault = readFile(source, input.bytes, readingOf(options));
    if (!input.fault.empty()) {
      complain(source, "cannot be read: " + input.fault);
      result = {.status = kUnreadable, .isDecoded = false};
      continue;
    }
    Capture capture;
    capture.source = source;
    capture.kind = options.decoding.kind;
    capture.bytes = input.bytes;
    series.begin(capture);
    decode(options.decoding, capture, [&](std::span<const Record> records) { series.records(records); });
    series.end(capture);
    if (capture.isClean()) continue;
    result.status = std::max<int>(result.status, kFindings);
    if (!view->showsFindings()) tell(capture.source, capture.findings, capture.furtherFindings);
  }
  if (!result.isDecoded) return result;
  if (options.subject == Subject::kDifference) {
    view->difference(series);
  } else {
    view->trend(series);
  }
  sink.drain(sink.text);
  return result;
}

}  // namespace

int run(const Options& asked) {
  Options options = asked;
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
  const ViewOptions viewOptions = {.width = terminalWidth()};
  const bool isSeries = options.subject == Subject::kDifference || options.subject == Subject::kTrend;
  const Result result =
      isSeries ? showSeries(options, viewOptions, output) : showCaptures(options, viewOptions, output);
  if (result.isDecoded) output.finish();
  return result.status;
}

}  // namespace kspdump
