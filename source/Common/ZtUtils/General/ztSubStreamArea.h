#pragma once

// The area after a stream's own data that holds its sub-streams: typed header, count, each with
// name and data, then the trailer of marker and offset. docs/stream-format.md has the bytes.

#include <cstdlib>
#include <memory>
#include <vector>

#include "source/Common/ZtUtils/General/ztStreamInterfaces.h"
#include "source/Common/ZtUtils/General/ztTypedStream.h"
#include "zt/fnd/String.h"

// First part of the trailer.
inline constexpr GUID kSubStreamMarker = {
    0xD300BBA1, 0xC3D6, 0x47CF, {0xB7, 0x52, 0xCB, 0x9F, 0xFD, 0x8A, 0xBC, 0xCC}};
inline constexpr int64_t kSubStreamTrailerSize = 24;
inline constexpr size_t kMostOfSubStreamArea = INT32_MAX;  // sub-streams, and bytes of each

struct CztFreeBlock {
  void operator()(unsigned char* block) const { free(block); }
};
using CztOwnedBlock = std::unique_ptr<unsigned char, CztFreeBlock>;

// One sub-stream as it is in the area; its data may end with an area of its own.
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

// Appends area and trailer at a stream's cursor. Counts and sizes are at most kMostOfSubStreamArea.
// Throws as the typed streams do.
class CztSubStreamAreaWriter {
 public:
  CztSubStreamAreaWriter(IztStream* stream, size_t count);
  void add(const zt::fnd::String& name, const unsigned char* bytes, int64_t sizeBytes);
  void finish(int64_t start);  // where the area begins

 private:
  CztOutStream m_out;
};
