// SPDX-License-Identifier: Apache-2.0
// kspdump's archives and compressed files: the input as a member that is opened in its turn, which can be
// gone about in, and as what comes through a pipe. Each capture in it is read, passed over or a fault, and
// none is larger than allowed.

#include <unistd.h>

#include <cstdlib>
#include <cstring>

#include "tools/kspdump/source/source.h"

using namespace kspdump;

namespace {

const Reading kReading = {.greatest = 4096, .isCapture = [](std::span<const unsigned char> bytes) {
                            return !bytes.empty() && bytes[0] == 'k';
                          }};

void check(Input& input) {
  using State = Input::State;
  if (const std::unique_ptr<Source> within = load(input, kReading)) {
    for (Input member; within->next(member);) check(member);
    return;
  }
  const bool isSound = input.state == State::kRead    ? input.bytes.size() <= kReading.greatest
                       : input.state == State::kFault ? !input.fault.empty() && input.bytes.size() == 0
                                                      : input.state == State::kPassedOver;
  if (!isSound) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  if (size == 0 || size > kReading.greatest) return 0;
  Input member;
  member.state = Input::State::kRead;
  member.isFound = true;
  std::memcpy(member.bytes.room(size), data, size);
  member.bytes.added(size);
  check(member);

  // A pipe holds more than an input has.
  int ends[2];
  if (pipe(ends) != 0 || write(ends[1], data, size) != static_cast<ssize_t>(size)) std::abort();
  close(ends[1]);
  Input piped;
  piped.path = "/dev/fd/" + std::to_string(ends[0]);
  check(piped);
  close(ends[0]);
  return 0;
}
