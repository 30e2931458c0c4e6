// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <functional>
#include <initializer_list>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kspdump/decode/capture.h"
#include "tools/kspdump/decode/decode.h"
#include "tools/kspdump/series/series.h"
#include "tools/kspdump/view/listing.h"

namespace kspdump {

/// Where a view puts its text. Whoever made it takes the text from there between two calls of the view;
/// within a long one, `drain` does, where there is one.
class Sink {
 public:
  std::string text;
  std::function<void(std::string& text)> drain;

  /// To be called where much may have been added.
  void offer() {
    constexpr size_t kMuch = size_t{1} << 16;
    if (text.size() >= kMuch && drain) drain(text);
  }
};

/// How captures, and series of them, are shown. One implementation a form; the caller never asks which one it
/// has.
///
/// Of many captures, several views of one form may show some each: `head`, `between` and `tail` then are
/// called of one of them, around all captures and between two, and nothing that a view keeps of one capture
/// may matter to the next.
class View {
 public:
  explicit View(Sink& sink) : sink_(sink) {}
  View(const View&) = delete;
  View& operator=(const View&) = delete;
  virtual ~View() = default;

  virtual void head() {}
  virtual void between() {}
  virtual void tail() {}

  /// Whether a capture's records are to come twice: first to `measure`, then, between `begin` and `end`, to
  /// `records`. The capture has its counts in `begin` only then.
  [[nodiscard]] virtual bool measures(const Capture& /*capture*/) const { return false; }
  virtual void measure(std::span<const Record> /*records*/) {}

  virtual void begin(Capture& capture) = 0;
  virtual void records(std::span<const Record> records) = 0;
  /// The capture's findings are complete, but for those of the view itself.
  virtual void end(Capture& capture) = 0;

  /// Instead of captures: what changed between a series' two points, how its values went, or a listing. A
  /// form that has none of it is not made for it.
  virtual void difference(const Series& /*series*/) {}
  virtual void trend(const Series& /*series*/) {}
  virtual void listing(const Listing& /*listing*/) {}

  /// Whether what is shown has the findings; where not, the program tells them on standard error.
  [[nodiscard]] virtual bool showsFindings() const = 0;

 protected:
  /// Ends a line, behind which the text may be taken.
  void endLine() {
    sink_.text += '\n';
    sink_.offer();
  }

  Sink& sink_;
};

/// How the views show what they show.
struct ViewOptions {
  /// Columns that lines are fitted to.
  size_t width = 80;
  /// Whether they end there: names give way then, and few records are shown in full.
  bool isTerminal = false;
  /// Whether each element of an array has a row of its own.
  bool expands = false;
  /// Whether captures are snapshots: their intervals are points of a series.
  bool isSnapshot = false;
};

/// What a form can be asked to show.
enum class Subject { kStatistics, kSnapshot, kDifference, kTrend, kListing };

/// A form that there is. Another one is a file in this room and a row in `forms.cpp`.
struct Form {
  std::string_view name;
  std::unique_ptr<View> (*make)(const ViewOptions& options, Sink& sink);
  std::initializer_list<Subject> shows;
};

/// All forms, or those of a subject.
std::vector<const Form*> formsFor(Subject subject);

/// The form of this name; null where there is none for the subject.
const Form* findForm(std::string_view name, Subject subject);

/// Decodes a capture and shows it. `batch` may serve one capture after another.
void show(const Decoding& decoding, Capture& capture, Batch& batch, View& view);

}  // namespace kspdump
