// The process keeps its first message for good, so each of them is provoked in a process of its own.

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>
#include <functional>

#include "ksp/error.h"
#include "ksp/media_statistics.h"
#include "ksp/statistics.h"
#include "tests/streams.h"

namespace {
bool storeHasMemory = true;
}

extern "C" void* __real_calloc(size_t count, size_t size);
extern "C" void* __wrap_calloc(size_t count, size_t size) {
  return storeHasMemory ? __real_calloc(count, size) : nullptr;
}

namespace ksp::test {
namespace {

std::string messageAfter(const std::function<void()>& action) {
  int ends[2];
  if (pipe(ends) != 0) return "no pipe";
  const pid_t child = fork();
  if (child == 0) {
    action();
    const std::string_view message = GetAPIErrorMessage();
    _exit(write(ends[1], message.data(), message.size()) == static_cast<ssize_t>(message.size()) ? 0 : 1);
  }
  close(ends[1]);
  std::string message(4096, '\0');
  const ssize_t size = read(ends[0], message.data(), message.size());
  close(ends[0]);
  int status = 0;
  if (waitpid(child, &status, 0) != child || status != 0 || size < 0) return "the child failed";
  message.resize(static_cast<size_t>(size));
  return message;
}

TEST(Message, TheFirstOneStays) {
  EXPECT_EQ(messageAfter([] {}), "NA");
  EXPECT_EQ(messageAfter([] {
              SetAPIErrorMessage("first %d", 1);
              SetAPIErrorMessage("second");
            }),
            "first 1");
  EXPECT_EQ(messageAfter([] { SetAPIErrorMessage("%s", std::string(2000, 'x').c_str()); }),
            std::string(1023, 'x'));
  EXPECT_EQ(messageAfter([] {
              storeHasMemory = false;
              SetAPIErrorMessage("lost");
              if (GlobalAPIErrorMessage != nullptr) std::abort();
              storeHasMemory = true;
              SetAPIErrorMessage("kept");
            }),
            "kept");
}

TEST(Message, ParsersReportWhatTheyCouldNotUse) {
  enum Parser { kByName, kByNumber, kLegacy, kMedia };
  const std::string ftl = "KSPFTLParseBufferToCxt";
  const std::string msp = "KSPMSPParseBufferToCxt: ";
  const struct {
    Parser parser;
    bool hasContext;
    Stream stream;
    std::string expected;
  } cases[] = {
      {kByName, true, Stream().stat(14, countUp(10)).stat(1, {1, 2}).stat(900, {1}).header(4, 1), "NA"},
      {kByName, false, Stream().stat(14, {}), "NA"},
      {kByName, false, Stream().stat(1, {1}).stat(2, {1}),
       ftl + ": version(1) cannot add 1 element to context"},
      {kByName, true, Stream().stat(14, countUp(12)),
       ftl + ": hostWriteLogHisto(14): (#10) cfg elements != (12) buffer elements"},
      {kByName, false, Stream().stat(14, {1}),
       ftl + ": hostWriteLogHisto(14): (#10) cfg elements != (1) buffer elements"},
      {kByName, false, Stream().stat(14, countUp(10)),
       ftl + ": hostWriteLogHisto(14): Cannot add 10 elements to context"},
      {kByName, false, Stream().stat(0x30000000, {1, 2, 3}),
       ftl + " 805306368: Cannot add 3 elements to context"},
      {kByName, true, Stream().stat(900, countUp(65536)), ftl + " 900: Cannot add 65536 elements to context"},
      {kByNumber, true, Stream().stat(14, countUp(12)), "NA"},
      {kByNumber, false, Stream().stat(1, {1}), ftl + " 1: Cannot add 1 elements to context"},
      {kLegacy, true, Stream().stat(14, countUp(12)).stat(0x30000001, {1}), "NA"},
      {kMedia, true, {}, msp + "Passed in invalid buffer or empty buffer"},
      {kMedia, true, Stream().media(4096, 4).media(0, 3).bytes(4097, 2).bytes(9, 2), "NA"},
      {kMedia, false, Stream().media(4096, 0), "NA"},
      {kMedia, true, Stream().media(4096, 3),
       msp + "passWithTmodeHard(4096): cfg 1 elements; (1*4) cfg bytes != (3) buffer bytes"},
      {kMedia, true, Stream().media(16385, 48, 8),
       msp + "random_read_size_ratio(16385): cfg 5 elements; (5*8) cfg bytes != (48) buffer bytes"},
      {kMedia, false, Stream().media(4254, 40),
       msp + "cbdr_step_3(4254): Error adding 10 elements to context"},
  };
  for (const auto& c : cases) {
    EXPECT_EQ(messageAfter([&] {
                GenericContext generic;
                LegacyContext legacy;
                GenericParserContext* const context = c.hasContext ? generic.get() : nullptr;
                if (c.parser == kByName) c.stream.run(KSPFTLParseBufferToCxt, context);
                if (c.parser == kByNumber) c.stream.run(KSPFTLParseStatKeyBufferToCxt, context);
                if (c.parser == kLegacy) c.stream.run(KSPParseBufferToCxt, legacy.get());
                if (c.parser == kMedia) c.stream.run(KSPMSPParseBufferToCxt, context);
              }),
              c.expected);
  }
  EXPECT_EQ(messageAfter([] { KSPMSPParseBufferToCxt(nullptr, nullptr, 4); }),
            msp + "Passed in invalid buffer or empty buffer");
}

}  // namespace
}  // namespace ksp::test
