// SPDX-License-Identifier: Apache-2.0
// Where captures come from: files, folders, archives, lists of names, standard input.
#pragma once

#include <cstdint>
#include <functional>
#include <limits>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "tools/kspdump/source/buffer.h"

namespace kspdump {

/// How captures are read.
struct Reading {
  static constexpr uint64_t kUsualGreatest = uint64_t{256} << 20;
  /// The parsers take lengths of 32 bits.
  static constexpr uint64_t kUtmostGreatest = std::numeric_limits<uint32_t>::max();

  /// The most bytes that a capture may have, `kUtmostGreatest` at most.
  uint64_t greatest = kUsualGreatest;
  /// Whether bytes, or the first of many, are a capture of the kind that is asked for: such bytes are never
  /// taken for an archive. Called by several threads.
  std::function<bool(std::span<const unsigned char>)> isCapture = [](auto) { return false; };
  /// Whether what is found in folders and archives is handed out even where it is no capture.
  bool keepsOthers = false;
};

/// A capture on its way: first what is to be opened, then its bytes.
struct Input {
  enum class State {
    kNamed,       ///< `path` is to be opened
    kRead,        ///< `bytes` are the capture's
    kPassedOver,  ///< no capture of the kind
    kFault,       ///< cannot be read; `fault` says why
  };

  State state = State::kNamed;
  /// What the capture is called: a path, and behind an archive's the member's own.
  std::string name;
  std::string path;
  Buffer bytes;
  std::string fault;
  /// Found in a folder or an archive, rather than named by the user.
  bool isFound = false;
  /// Archives around it.
  unsigned depth = 0;

  /// Makes it one that nothing is known of.
  void reset();

  void fail(std::string why) {
    state = State::kFault;
    fault = std::move(why);
    bytes.clear();
  }
};

/// Hands out captures one after another.
class Source {
 public:
  Source() = default;
  Source(const Source&) = delete;
  Source& operator=(const Source&) = delete;
  virtual ~Source() = default;

  /// Fills `input`, whatever it held, with the next capture, which may be still to be loaded. Returns false
  /// when there is none. Never throws but std::bad_alloc, and goes on after it.
  virtual bool next(Input& input) = 0;

  /// Whether it is known already that there is none.
  [[nodiscard]] virtual bool isOver() const { return false; }
};

/// What the user named; "-" is standard input, shown as `label`.
class Names : public Source {
 public:
  explicit Names(std::vector<std::string> paths, std::string label = "-")
      : paths_(std::move(paths)), label_(std::move(label)) {}
  bool next(Input& input) override;
  [[nodiscard]] bool isOver() const override { return at_ == paths_.size(); }

 private:
  std::vector<std::string> paths_;
  std::string label_;
  size_t at_ = 0;
};

/// The names in a list, each ended by a NUL, read as they are needed. Where the list is "-", standard input,
/// that cannot be named in it.
std::unique_ptr<Source> namesFrom(const std::string& list);

/// What several sources give, one behind the other.
std::unique_ptr<Source> joined(std::vector<std::unique_ptr<Source>> sources);

/// Takes a capture to its last state, reading it where it is not read. Where it is a folder, or an archive
/// (tar or zip, compressed or not), returns the source of what that holds instead; a compressed capture is
/// unpacked. Throws std::bad_alloc alone.
std::unique_ptr<Source> load(Input& input, const Reading& reading);

/// Reads the one capture that `path` names, or "-": a file, a compressed one, or the only one in an archive.
/// Throws std::bad_alloc alone.
Input loadOne(const std::string& path, const Reading& reading);

/// Reads that capture's bytes alone. Returns an empty text, or why it cannot be read.
std::string readFile(const std::string& path, Buffer& bytes, const Reading& reading = {});

}  // namespace kspdump
