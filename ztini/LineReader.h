#pragma once

#include <cstdint>
#include <cstdio>

// Cuts a stream into lines. CR, LF and NUL each end a line; the second half of a CR LF or LF CR
// pair does not end another one.

inline constexpr int32_t kLineFileBufferSize = 2084;

struct LineFile;

// Brings the next bytes into the buffer. 0, or a negative status.
using LineFileFillFunction = int32_t (*)(LineFile* state);

struct LineFile {
  // The caller's.
  FILE* file;
  LineFileFillFunction fill;
  char buffer[kLineFileBufferSize];
  // The next byte of the buffer, and how many are left from there.
  const char* cursor;
  int32_t bytesLeft;
  // The number of the present line, from 1; stays at INT32_MAX.
  int32_t linesCompleted;
  int64_t totalBytes;    // taken from the stream
  char lastTerminator;   // 0 before the first line has ended
  int64_t lineOffset;    // where the present line began
  int64_t skippedBytes;  // second halves of pairs
};

// State over a stream that stays the caller's; null without memory.
LineFile* LineFileNew(FILE* file);
void LineFileDispose(LineFile* state);

// The fill function of a FILE; kIniReadFailed if the stream reports an error.
int32_t LineFileReadFromFile(LineFile* state);

// IniLineInputFunction over a LineFile. A call takes bytes until a line ends or `maximum`
// characters are stored; the terminator after exactly `maximum` characters is left to the next
// call, which sees it as its first byte.
int32_t IniLineFileInputFunction(void* lineFile, char* buffer, int32_t maximum, int32_t* endOfFile,
                                 int32_t* endOfLine, int32_t* lineNumber);
