#pragma once

// The area behind a stream's own data that holds its sub-streams: typed header, count, each with
// name and data, then the trailer of marker and offset. docs/stream-format.md has the bytes.

#include <stdlib.h>

#include <memory>
#include <vector>

#include "source/Common/ZtUtils/General/CztStreamBaseImp.h"

inline constexpr int64_t kSubStreamTrailerSize = 24;

struct CztFreeBlock {
  void operator()(unsigned char* block) const { free(block); }
};
using CztOwnedBlock = std::unique_ptr<unsigned char, CztFreeBlock>;

// One sub-stream as it stands in the area; its data may end with an area of its own.
struct CztSubStreamBlock {
  zt::fnd::String name;
  CztOwnedBlock data;  // never null
  uint32_t sizeBytes;
};

// Reads the trailer of a stream of this size. False if there is none; otherwise *offset is where it
// says that the area begins, which may be any number but -1. Throws as the typed streams do.
bool ReadSubStreamTrailer(IztStream* stream, int64_t streamSize, int64_t* offset);

// Reads an area that ends in front of its trailer at `areaEnd`. Counts and lengths are checked
// against the bytes that are there before memory is taken for them.
// Throws CztStreamException for an offset, count or length that cannot be, CztEndOfStreamException
// where the area ends within a value, std::bad_alloc.
std::vector<CztSubStreamBlock> ReadSubStreamArea(IztStream* stream, int64_t offset,
                                                 int64_t areaEnd);

// Makes streams of the blocks, `depth` areas deep, with the sub-streams of their own loaded. Of two
// names that are equal the later counts. Throws what loading throws.
CztSubStreamMap AttachSubStreams(std::vector<CztSubStreamBlock> blocks, unsigned depth);

// Appends area and trailer at the stream's cursor, which is at `start`. E_INVALIDARG for a count or
// size beyond 31 bits, and failures of the sub-streams' own WriteSubStreamInfo. Throws as the typed
// streams do.
HRESULT WriteSubStreamArea(IztStream* stream, const CztSubStreamMap& subStreams, int64_t start);
