#pragma once

#include <cstddef>
#include <cstdint>

#include "ztini/ztini.h"

// A value that was too long for one line is in the file as several items, "Name Line0001",
// "Name Line0002" and so on. Writer.cpp splits it; reading puts the pieces together again here.

inline constexpr size_t kIniLongestBaseName = 255;

// 1 if the name is that of a piece: text, " Line" and a decimal number. `baseLength` is the length
// of the text before the first " Line", `number` the piece's number. 0 for any other name, a number
// beyond the platform's long and a base beyond kIniLongestBaseName included.
int32_t AnalyzeItemName(const char* name, size_t* baseLength, long* number);

bool IniEndsAsPiece(const char* name, const char* end);

// False only if the name is not that of a piece. For a name that is known by its ends.
inline bool IniMayBePiece(const char* name, const char* end) {
  return end > name && end[-1] >= '0' && end[-1] <= '9' && IniEndsAsPiece(name, end);
}

// Merges, in each section, every run of a piece numbered 1 and the pieces with other numbers that
// follow it into one item. The numbers need not ascend and the base names may differ; the first
// piece gives name, place, line and quote. 0, or kIniOutOfMemory with the remaining runs unmerged.
int32_t IniJoinPieces(IniStructForwardReferenceTag* doc);
