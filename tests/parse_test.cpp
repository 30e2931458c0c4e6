// Holds the parsers against parse_cases.txt. The process keeps its first message for good, so each parser
// runs in a process of its own.

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <fstream>
#include <functional>
#include <map>

#include "fuzz/context_check.h"
#include "ksp/error.h"
#include "ksp/exporter.h"
#include "ksp/media_statistics.h"
#include "ksp/records.hpp"
#include "ksp/statistics.h"
#include "platform/driver_service.h"
#include "tests/streams.h"

const char PropertyMatchKey[] = "of this test";

namespace {
bool storeHasMemory = true;
}

extern "C" void* __real_calloc(size_t count, size_t size);
extern "C" void* __wrap_calloc(size_t count, size_t size) {
  return storeHasMemory ? __real_calloc(count, size) : nullptr;
}

namespace ksp::test {
namespace {

// Returns what `action` returns and, on a second line, the message that it leaves.
std::string apart(const std::function<std::string()>& action) {
  int ends[2];
  if (pipe(ends) != 0) return "no pipe";
  const pid_t child = fork();
  if (child == 0) {
    std::string text = action();
    text.append("\n").append(GetAPIErrorMessage());
    std::FILE* const out = fdopen(ends[1], "w");
    _exit(std::fputs(text.c_str(), out) >= 0 && std::fclose(out) == 0 ? 0 : 1);
  }
  close(ends[1]);
  std::FILE* const in = fdopen(ends[0], "r");
  std::string text;
  for (int c = 0; (c = std::fgetc(in)) != EOF;) text.push_back(static_cast<char>(c));
  static_cast<void>(std::fclose(in));
  int status = 0;
  return waitpid(child, &status, 0) == child && status == 0 ? text : "the child failed";
}

template <class Owner, class Parse>
std::string outcome(const Stream& stream, Parse parse, bool lost) {
  Owner context;
  const auto result = stream.into(parse, lost ? nullptr : context.get());
  requireSound(listsOf(*context.get()));
  return std::to_string(result) + " " + textOf(context);
}

template <class Records>
std::string walked(Records records) {
  constexpr const char* kReasons[] = {"", "complete", "tail", "marker", "invalid", "overrun"};
  std::ranges::for_each(records, [](const Record&) {});
  const Ending& ending = records.ending();
  return std::to_string(ending.offset) + " " + kReasons[static_cast<int>(ending.reason)];
}

std::string run(const std::string& parser, const std::string& kind, const std::string& text) {
  const bool lost = parser.ends_with("-lost");
  const bool isMedia = kind == "media";
  const Stream stream = isMedia ? Stream::media(text) : Stream::statistics(text);
  if (parser.starts_with("generic")) return outcome<GenericContext>(stream, KSPFTLParseBufferToCxt, lost);
  if (parser.starts_with("number"))
    return outcome<GenericContext>(stream, KSPFTLParseStatKeyBufferToCxt, lost);
  if (parser.starts_with("legacy")) return outcome<LegacyContext>(stream, KSPParseBufferToCxt, lost);
  if (parser.starts_with("media")) return outcome<GenericContext>(stream, KSPMSPParseBufferToCxt, lost);
  const auto walk = [&](const void*, const void* bytes, uint32_t length) {
    return isMedia ? walked(MediaRecords(bytes, length)) : walked(StatisticsRecords(bytes, length));
  };
  return parser == "walk" ? stream.into(walk, static_cast<void*>(nullptr)) : "no parser has this name";
}

TEST(Parse, Cases) {
  std::ifstream file(KSP_PARSE_CASES);
  std::string what, kind, stream, parser, expected, message;
  int checked = 0;
  const auto check = [&] {
    if (parser.empty()) return;
    SCOPED_TRACE(what + ", " + parser);
    const std::string found = apart([&] { return run(parser, kind, stream); });
    EXPECT_EQ(found, expected + '\n' + message);
    parser.clear();
    ++checked;
  };
  for (std::string line; std::getline(file, line);) {
    const std::string word = line.substr(0, line.find(' '));
    const std::string rest = line.substr(std::min(word.size() + 1, line.size()));
    if (word == "says") {
      message = rest;
      continue;
    }
    check();
    if (word.empty() || word == "#") continue;
    if (word == "case") {
      what = rest;
      kind.clear();
    } else if (kind.empty()) {
      kind = word;
      stream = rest;
    } else {
      parser = word;
      const std::string entries = expanded(rest.substr(std::min(rest.find(' '), rest.size())));
      expected = rest.substr(0, rest.find(' ')) + " " + entries;
      message = "NA";
    }
  }
  check();
  EXPECT_GT(checked, 90) << "cases were lost";
}

TEST(Parse, NullStreams) {
  const auto emptyFor = [](auto parse, auto context) { return parse(context.get(), nullptr, 16); };
  EXPECT_EQ(emptyFor(KSPFTLParseBufferToCxt, GenericContext()), 0U);
  EXPECT_EQ(emptyFor(KSPParseBufferToCxt, LegacyContext()), 0);
  EXPECT_EQ(apart([&] { return std::to_string(emptyFor(KSPMSPParseBufferToCxt, GenericContext())); }),
            "0\nKSPMSPParseBufferToCxt: Passed in invalid buffer or empty buffer");
}

TEST(Statistics, SummaryCopiesItsStatistics) {
  const auto valueOf = [](uint64_t key) { return key << 32 | (key + 1); };
  std::ostringstream stream;
  for (const uint64_t key :
       {4U, 7U, 12U, 13U, 17U, 18U, 19U, 20U, 28U, 45U, 48U, 49U, 50U, 51U, 52U, 53U, 56U}) {
    stream << key << ":1 " << key << ':' << valueOf(key) << ",2 ";
  }
  LegacyContext c;
  ASSERT_EQ(Stream::statistics(stream.str() + "265:1..6 265:9,8").into(KSPParseBufferToCxt, c.get()), 1);
  const std::vector<uint64_t> low = {c->exportVersion, c->numVirtualBlocks, c->blocksPerVirtualBlock,
                                     c->pagesPerVirtualBlock, c->bytesPerPage};
  EXPECT_EQ(low, (std::vector<uint64_t>{54, 53, 52, 51, 50}));
  const std::vector<uint64_t> whole = {c->hostReads,      c->hostWrites,    c->numFreeVirtualBlocks,
                                       c->wearLevMoves,   c->nandReads,     c->nandWrites,
                                       c->bandErases,     c->IND_pool_free, c->IND_pool_count,
                                       c->utilFormatTime, c->numSleepOps,   c->maxHighEnduranceBlockErases};
  std::vector<uint64_t> expected;
  for (const uint64_t key : {7U, 4U, 48U, 17U, 19U, 18U, 20U, 12U, 13U, 56U, 28U, 45U}) {
    expected.push_back(valueOf(key));
  }
  EXPECT_EQ(whole, expected);
  EXPECT_EQ(std::vector<uint64_t>(c->readCountHisto, c->readCountHisto + 5),
            (std::vector<uint64_t>{9, 8, 3, 4, 5}));
  EXPECT_EQ(c->reserved0 + c->reserved1[0] + c->reserved1[1] + c->reserved1[2] + c->reserved2, 0U);

  c.get()->parseMarker = 0;
  EXPECT_EQ(Stream::statistics("1*1..7").into(KSPParseBufferToCxt, c.get()), 0);
  EXPECT_EQ(c->exportVersion, 54U) << "a stream without a word changes only the marker";
  EXPECT_EQ(c->parseMarker, UINT32_MAX);
  EXPECT_EQ(Stream::statistics("53:7 1#1").into(KSPParseBufferToCxt, c.get()), 0);
  EXPECT_EQ(c->exportVersion, 0U) << "a bad header takes back the version alone";
  EXPECT_EQ(c->hostWrites, valueOf(4));
}

TEST(KeyTables, AreCompleteAndFindTheirRows) {
  std::map<unsigned, unsigned> keysOfCount;
  for (const KeyEntry& key : kStatsKeys) ++keysOfCount[key.count];
  const std::map<unsigned, unsigned> expected = {
      {1, 535}, {2, 15}, {3, 3},  {4, 12}, {5, 12}, {6, 3},  {8, 12}, {9, 2},   {10, 23}, {11, 2}, {12, 2},
      {16, 9},  {20, 1}, {22, 3}, {30, 1}, {32, 9}, {45, 1}, {64, 2}, {100, 2}, {160, 1}, {256, 1}};
  EXPECT_EQ(keysOfCount, expected);
  unsigned statistics = 0, media = 0, singles = 0;
  for (uint32_t key = 0; key <= UINT16_MAX; ++key) {
    if (const KeyEntry* const row = findStatsKey(key)) statistics += row->key == key;
    const MSPKeyEntry* const row = LookupMSPKey(static_cast<uint16_t>(key));
    if (row == nullptr) continue;
    media += row->key == key && row->width == (key < 12288 ? 4 : 8);
    singles += row->count == 1;
  }
  EXPECT_EQ(statistics, 651U);
  EXPECT_EQ(media, 234U);
  EXPECT_EQ(singles, 152U);
  EXPECT_TRUE(findStatsKey(826) && !findStatsKey(827) && !findStatsKey(0x10001) && !findStatsKey(~0U));
}

TEST(ParserSlots, LeadToTheParsersThatAControllerNeeds) {
  for (int row = 0; row < 3; ++row) {
    const ExporterEntry& entry = nand_exporters_tunnel[row];
    EXPECT_TRUE(entry.parseBuffer == KSPParseBufferToCxt && entry.releaseContext == KSPReleaseContext &&
                entry.parseFtlBuffer == KSPFTLParseBufferToCxt &&
                entry.parseStatKeyBuffer == KSPFTLParseStatKeyBufferToCxt &&
                entry.releaseGenericContext == ReleaseGenericParserCxt);
    EXPECT_EQ(entry.parseMspBuffer != nullptr, row == 0);
    EXPECT_EQ(entry.getMspStatsSelector != nullptr, row == 0);
  }
  const ExporterEntry& last = nand_exporters_tunnel[3];
  EXPECT_TRUE(!last.parseBuffer && !last.releaseContext && !last.parseMspBuffer && !last.parseFtlBuffer &&
              !last.parseStatKeyBuffer && !last.releaseGenericContext);
}

TEST(Message, TheFirstOneStays) {
  EXPECT_EQ(apart([] {
              storeHasMemory = false;
              SetAPIErrorMessage("lost");
              std::string before = GetAPIErrorMessage();
              storeHasMemory = true;
              SetAPIErrorMessage("%s", std::string(2000, 'x').c_str());
              SetAPIErrorMessage("second");
              return before;
            }),
            "NA\n" + std::string(1023, 'x'));
}

}  // namespace
}  // namespace ksp::test
