// SPDX-License-Identifier: Apache-2.0
#include "ksp/context.h"

#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <string_view>

#include "context/append.h"
#include "context/list_ends.h"
#include "ksp/detail/elements.hpp"

// Clients of other languages read these structures by offset.
static_assert(offsetof(KSPParseContext, entries) == 0 && sizeof(GenericParserContext) == 4 * sizeof(void*));
#ifdef __LP64__
static_assert(offsetof(NameValueNode, text) == 0 && offsetof(NameValueNode, value) == 104 &&
              offsetof(NameValueNode, next) == 112);
static_assert(offsetof(GenericParserContext, nameHead) == 0 &&
              offsetof(GenericParserContext, nameTail) == 8 &&
              offsetof(GenericParserContext, valueHead) == 16 &&
              offsetof(GenericParserContext, valueTail) == 24);
static_assert(
    offsetof(KSPParseContext, exportVersion) == 32 && offsetof(KSPParseContext, parseMarker) == 36 &&
    offsetof(KSPParseContext, reserved0) == 40 && offsetof(KSPParseContext, numVirtualBlocks) == 44 &&
    offsetof(KSPParseContext, blocksPerVirtualBlock) == 48 &&
    offsetof(KSPParseContext, pagesPerVirtualBlock) == 52 && offsetof(KSPParseContext, bytesPerPage) == 56 &&
    offsetof(KSPParseContext, hostReads) == 64 && offsetof(KSPParseContext, hostWrites) == 72 &&
    offsetof(KSPParseContext, numFreeVirtualBlocks) == 80 && offsetof(KSPParseContext, wearLevMoves) == 88 &&
    offsetof(KSPParseContext, nandReads) == 96 && offsetof(KSPParseContext, nandWrites) == 104 &&
    offsetof(KSPParseContext, bandErases) == 112 && offsetof(KSPParseContext, reserved1) == 120 &&
    offsetof(KSPParseContext, IND_pool_free) == 144 && offsetof(KSPParseContext, IND_pool_count) == 152 &&
    offsetof(KSPParseContext, utilFormatTime) == 160 && offsetof(KSPParseContext, numSleepOps) == 168 &&
    offsetof(KSPParseContext, maxHighEnduranceBlockErases) == 176 &&
    offsetof(KSPParseContext, readCountHisto) == 184 && offsetof(KSPParseContext, reserved2) == 224 &&
    sizeof(KSPParseContext) == 232);
#endif

namespace {

// No more of a text is looked at than a node can hold.
std::string_view view(const char* text) {
  return {text, strnlen(text, ksp::kMaxTextLength)};
}

void freeNodes(NameValueNode* node) {
  while (node != nullptr) {
    NameValueNode* const next = node->next;
    std::free(node);
    node = next;
  }
}

}  // namespace

int AddSingleValueToGenericContext(GenericParserContext* context, const char* prefix, const char* name,
                                   uint64_t value) {
  if (context == nullptr) return 0;
  return ksp::appendEntry(context, value, view(prefix), view(name)) ? 1 : 0;
}

int AddMultipleFieldsToGenericContext(GenericParserContext* context, const char* name, const void* source,
                                      uint32_t width, uint32_t count) {
  const ksp::Elements elements(static_cast<const unsigned char*>(source), width, count);
  if (ksp::isNothing(elements)) return 1;
  if (!ksp::takes(context, elements)) return 0;
  return ksp::appendElements(context, elements, view(name)) ? 1 : 0;
}

void ReleaseGenericParserCxt(GenericParserContext* context) {
  if (context == nullptr) return;
  freeNodes(context->nameHead);
  freeNodes(context->valueHead);
  *context = {};
}

void KSPReleaseContext(KSPParseContext* context) {
  if (context == nullptr) return;
  ReleaseGenericParserCxt(&context->entries);
  *context = {};
}
