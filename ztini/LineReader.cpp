// Three bytes end a line, CR, LF and NUL, and files mix them. A terminator that comes first in a
// call and differs from the last one is the second half of a pair and is skipped; one that is the
// same begins an empty line. That rule has no memory of where a line began, so that it also skips a
// terminator after a line that filled the caller's buffer (see TextLines.h).
#include "ztini/LineReader.h"

#include <climits>

#include "ztini/Alloc.h"
#include "ztini/OpenFile.h"
#include "ztini/ztini.h"

namespace {

bool IsTerminator(char c) { return c == '\r' || c == '\n' || c == '\0'; }

enum class LineState { Open, Ended, FileEnded };

// Takes bytes until a line ends or `maximum` are stored; a negative fill status goes to `status`.
LineState TakeBytes(LineFile* state, char* buffer, int32_t maximum, int32_t* stored,
                    int32_t* status) {
  bool first = true;
  while (*stored < maximum) {
    if (!state->bytesLeft) {
      *status = state->fill(state);
      if (*status < 0) return LineState::Open;
      // A last line without a terminator is a line, if it has any bytes.
      if (!state->bytesLeft) return *stored ? LineState::Ended : LineState::FileEnded;
    }
    const char c = *state->cursor++;
    --state->bytesLeft;
    if (!IsTerminator(c)) {
      buffer[(*stored)++] = c;
    } else if (first && c != state->lastTerminator) {
      ++state->skippedBytes;
      ++state->lineOffset;
    } else {
      state->lastTerminator = c;
      return LineState::Ended;
    }
    first = false;
  }
  return LineState::Open;
}

}  // namespace

LineFile* LineFileNew(FILE* file) {
  LineFile* state = static_cast<LineFile*>(ztini::Allocate(sizeof(LineFile)));
  if (!state) return nullptr;
  state->file = file;
  state->fill = LineFileReadFromFile;
  state->cursor = state->buffer;
  state->bytesLeft = 0;
  state->linesCompleted = 0;
  state->totalBytes = 0;
  state->lastTerminator = 0;
  state->lineOffset = 0;
  state->skippedBytes = 0;
  return state;
}

void LineFileDispose(LineFile* state) { free(state); }

int32_t LineFileReadFromFile(LineFile* state) {
  const size_t bytes = ztini::ReadBytes(state->buffer, sizeof state->buffer, state->file);
  state->cursor = state->buffer;
  state->bytesLeft = 0;
  if (ferror(state->file)) return kIniReadFailed;
  state->bytesLeft = static_cast<int32_t>(bytes);
  state->totalBytes += state->bytesLeft;
  return 0;
}

int32_t IniLineFileInputFunction(void* lineFile, char* buffer, int32_t maximum, int32_t* endOfFile,
                                 int32_t* endOfLine, int32_t* lineNumber) {
  LineFile* state = static_cast<LineFile*>(lineFile);
  int32_t stored = 0, status = 0;
  const LineState end = TakeBytes(state, buffer, maximum, &stored, &status);
  buffer[stored] = 0;
  *endOfFile = end == LineState::FileEnded;
  *endOfLine = end == LineState::Ended;
  if (end == LineState::Ended) {
    // Saturates: the number is for messages.
    if (state->linesCompleted < INT32_MAX) ++state->linesCompleted;
    state->lineOffset = state->totalBytes - state->bytesLeft;
  }
  if (status >= 0) *lineNumber = state->linesCompleted;
  return status;
}
