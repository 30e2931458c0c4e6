// SPDX-License-Identifier: Apache-2.0
// Captures of a source shown by several threads, and told of in their order.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "tools/kspdump/source/source.h"
#include "tools/kspdump/view/view.h"

namespace kspdump {

/// What a thread says of one capture after another. It comes out when all that was before has.
class Lane {
 public:
  /// Text to be written; much of it goes, or waits for its turn, as it is offered.
  Sink sink;

  /// Does something in its place among the texts, on any thread but never beside another such action or a
  /// text's writing.
  void then(std::function<void()> action) { actions_.push_back({sink.text.size(), std::move(action)}); }

 private:
  friend class InOrder;

  struct Action {
    /// Behind so much of the text.
    size_t at;
    std::function<void()> run;
  };
  std::vector<Action> actions_;
};

/// Shows a capture that is read, or tells why it cannot be.
using ShowInput = std::function<void(Input& input)>;

/// What became of all that is in a folder or an archive that the user named.
struct Found {
  std::string name;
  uint64_t captures;
  uint64_t passedOver;
};

/// How captures are worked through.
struct Work {
  Reading reading;
  /// The most threads; fewer where the system has no more of them.
  size_t jobs = 1;
  /// Makes a thread's own `ShowInput`, which tells by way of the lane.
  std::function<ShowInput(Lane& lane)> makeShow;
  /// Both are called in order, one after another.
  std::function<void(std::string_view text)> write;
  std::function<void(const Found& found)> found;
};

/// Works through all that a source gives, the folders and archives in it too. Whatever `write`, or a
/// `ShowInput`, throws ends the work and is thrown from here.
void showInOrder(std::unique_ptr<Source> source, const Work& work);

/// Cores that this process may use.
size_t usableCores();

}  // namespace kspdump
