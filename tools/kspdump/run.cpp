// The way of a capture through the rooms: from its source by way of a decoder and a view to the output.

#include "tools/kspdump/run.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <memory>
#include <new>

#include "tools/kspdump/decode/snapshot.h"
#include "tools/kspdump/source/in_order.h"
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
void tell(const Capture& capture) {
  for (const Finding& finding : capture.findings) {
    complain(capture.source, "offset " + std::to_string(finding.offset) + ": " + finding.reason);
  }
  if (capture.furtherFindings != 0) {
    complain(capture.source, std::to_string(capture.furtherFindings) + " further findings");
  }
}

/// Exit status, and whether anything was decoded that an output file could hold.
struct Result {
  int status = kClean;
  bool isDecoded = false;
};

/// A capture's way through the program: its bytes or why there are none, what was decoded, and its text.
struct Job {
  Input input;
  Capture capture;
  Sink sink;
  std::unique_ptr<View> view;
};

Result showCaptures(const Options& options, const ViewOptions& viewOptions, Output& output) {
  const bool isAlone = options.sources.size() == 1;
  Progress progress(options.sources.size(), output);
  Result result;
  Sink frame;
  const std::unique_ptr<View> framing = options.form->make(viewOptions, frame);
  const auto write = [&](std::string& text) {
    output.write(text);
    text.clear();
  };

  framing->head();
  inOrder<Job>(
      options.sources.size(), std::min(options.jobs, options.sources.size()),
      [&](size_t index, Job& job) {
        if (job.view == nullptr) job.view = options.form->make(viewOptions, job.sink);
        // What need not wait for its turn is not kept.
        if (isAlone) {
          job.sink.drain = [&](std::string& text) {
            write(frame.text);
            write(text);
          };
        }
        job.input.name = options.sources[index];
        try {
          job.input.fault = readFile(job.input.name, job.input.bytes);
          if (!job.input.fault.empty()) return;
          job.capture.source = job.input.name;
          job.capture.bytes = job.input.bytes;
          show(options.decoding, job.capture, *job.view);
        } catch (const std::bad_alloc&) {
          // One capture too large does not stop the others.
          const std::string name = job.input.name;
          job = {};
          job.input.name = name;
          job.input.fault = "out of memory";
        }
      },
      [&](size_t index, Job& job) {
        if (!job.input.fault.empty()) {
          progress.hide();
          complain(job.input.name, "cannot be read: " + job.input.fault);
          result.status = kUnreadable;
        } else {
          if (result.isDecoded) framing->between();
          result.isDecoded = true;
          write(frame.text);
          write(job.sink.text);
          if (!job.capture.isClean()) {
            result.status = std::max<int>(result.status, kFindings);
            progress.hide();
            if (!framing->showsFindings()) tell(job.capture);
          }
        }
        progress.show(index + 1);
      });
  progress.hide();
  framing->tail();
  write(frame.text);
  return result;
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
    input.fault = readFile(source, input.bytes);
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
    if (!view->showsFindings()) tell(capture);
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
  const ViewOptions viewOptions = {.width = terminalWidth()};
  const bool isSeries = options.subject == Subject::kDifference || options.subject == Subject::kTrend;
  const Result result =
      isSeries ? showSeries(options, viewOptions, output) : showCaptures(options, viewOptions, output);
  if (result.isDecoded) output.finish();
  return result.status;
}

}  // namespace kspdump
