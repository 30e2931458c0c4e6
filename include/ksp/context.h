// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_CONTEXT_H
#define KSP_CONTEXT_H

/*
 * Contexts: what the parsers write and their callers read.
 *
 * A context holds an ordered series of entries, each a name and an unsigned 64-bit value, as two lists that
 * are walked in step: the k-th name node and the k-th value node are the k-th entry. The caller owns the
 * context object and hands it over zero-filled; the nodes belong to the context and are freed by its release
 * function alone. A context belongs to one thread at a time. C++ callers find a range over the entries and
 * owning wrappers in <ksp/entries.hpp>.
 */

#include <stdint.h>

#include "ksp/api.h"

KSP_BEGIN_DECLARATIONS

enum { KSPNodeTextSize = 100 };

typedef struct NameValueNode {
  /** NUL-terminated, at most 98 characters: the name, or the value in unsigned decimal. */
  char text[KSPNodeTextSize];
  /** The value in a value node; without meaning in a name node. */
  uint64_t value;
  /** The list's next node, or null in its last one. */
  struct NameValueNode* next;
} NameValueNode;

/** The four list ends of a context, all null while it is empty. */
typedef struct GenericParserContext {
  NameValueNode* nameHead;
  NameValueNode* nameTail;
  NameValueNode* valueHead;
  NameValueNode* valueTail;
} GenericParserContext;

/**
 * Entries, and beside them the summary block: statistics that a client can read without walking the lists.
 *
 * Each summary field bears the name of the statistic that it copies and holds the value of that statistic's
 * latest record.
 */
typedef struct KSPParseContext {
  GenericParserContext entries;
  /** Set to 0 when a stream ends in a bad header. */
  uint32_t exportVersion;
  /** All ones once a stream was parsed into the context. */
  uint32_t parseMarker;
  uint32_t reserved0;
  uint32_t numVirtualBlocks;
  uint32_t blocksPerVirtualBlock;
  uint32_t pagesPerVirtualBlock;
  uint32_t bytesPerPage;
  uint64_t hostReads;
  uint64_t hostWrites;
  uint64_t numFreeVirtualBlocks;
  uint64_t wearLevMoves;
  uint64_t nandReads;
  uint64_t nandWrites;
  uint64_t bandErases;
  uint64_t reserved1[3];
  uint64_t IND_pool_free;
  uint64_t IND_pool_count;
  uint64_t utilFormatTime;
  uint64_t numSleepOps;
  uint64_t maxHighEnduranceBlockErases;
  uint64_t readCountHisto[5];
  uint64_t reserved2;
} KSPParseContext;

/**
 * Appends one entry, named `prefix` directly followed by `name` and cut to 98 characters.
 *
 * Every byte of its nodes that holds nothing is 0.
 * `context` may be null, and `prefix` and `name`, NUL-terminated, are not read then. Costs two allocations
 * and constant time. Returns 1; or 0 when `context` is null or memory ran out, with the context as it was.
 */
KSP_API int AddSingleValueToGenericContext(GenericParserContext* context, const char* prefix,
                                           const char* name, uint64_t value);

/**
 * Appends `count` entries from packed little-endian unsigned integers of `width` bytes each.
 *
 * `source` holds `width` * `count` bytes of any alignment, `width` is 1 to 8 and `count` at most 65535. One
 * entry bears the bare `name`; several bear `name` directly followed by their decimal index from 0.
 * Returns 1 when every element was appended, and also when `width` or `count` is 0 (nothing is read, not even
 * `name`, or appended then). Returns 0 when `width` or `count` is above its limit or `context` is null, with
 * nothing read or appended; or when memory ran out, with every element appended for which there was memory.
 */
KSP_API int AddMultipleFieldsToGenericContext(GenericParserContext* context, const char* name,
                                              const void* source, uint32_t width, uint32_t count);

/** Frees every node and empties the context, which can then be filled again. `context` may be null. */
KSP_API void ReleaseGenericParserCxt(GenericParserContext* context);

/** Frees every node and clears the whole context, its summary block included. `context` may be null. */
KSP_API void KSPReleaseContext(KSPParseContext* context);

KSP_END_DECLARATIONS

#endif
