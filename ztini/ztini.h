#pragma once

#include <cstdint>
#include <cstdio>

// The INI engine: a document of sections and items in memory, read from and written to a file.
// The dialect is described in docs/ini-dialect.md.
//
// Rules for the whole surface
// 1. Results. 1: done or found. 0: not found, or nothing to do. Negative: an IniStatus. Reading,
//    writing and IniGetFileTimestamp give 0 on success.
// 2. Text is bytes without NUL. Names are stored without surrounding white space; they compare
//    without regard to case and to white space around them, in the locale in force.
// 3. Null. A null document, section or name is one that is not found; a null output is not
//    written. Outputs that point to text are set to null when there is none; number outputs stay
//    as they are unless the result is 1.
// 4. Positions are 1-based; 0 is the last and -1 the first.
// 5. With several sections or items of one name the first in order is found.
// 6. Nothing throws. Memory that runs out gives kIniOutOfMemory. Look-up needs none: without memory
//    for the index of many names it takes linear time, while reading and putting report it.
// 7. Threads. Nothing locks: a document belongs to one caller at a time. Different documents share
//    nothing.
// 8. Cost. Look-up takes constant time on average, reading and writing linear time.

// How the folder is built. A file is read whole (Reader.cpp) and cut into lines (TextLines, or
// LineReader and LineBuffer for a caller's own source); the parser makes records of them
// (Document.h) and joins split values (Join.h). Records stay in file order in a list, with a hash
// index over their names once there are many (NameList, NameIndex). Look-up, values and puts work
// on that. A save renders the document to one text (Writer.cpp) and puts it in the target's place
// (FileReplace.h).
//
// The containers are the engine's own, and not the standard ones, for rule 6 (Alloc.h) and for the
// size of a record (NameIndex.h).
struct IniStructForwardReferenceTag;
struct stat;
struct IniSection;
struct IniEntry;

enum IniStatus : int32_t {
  kIniNoRoom = -2,               // the line limit leaves no space beside an item's name
  kIniUnsupportedEncoding = -3,  // a UTF-16 or UTF-32 byte order mark
  kIniEmptyPath = -4,            // IniGetFileTimestamp only
  kIniEmptyName = -6,            // IniPut: a name without any character but white space
  kIniOutOfMemory = -12,
  kIniNotReplaceable = -13,  // target not writable, or rename failed
  kIniBadPath = -22,         // null or empty path, or a file that cannot be examined
  kIniWriteFailed = -28,
  kIniCannotOpen = -5001,
  kIniReadFailed = -5002,
  kIniNoTemporary = -5003,
  kIniCannotCreate = -5004,
  kIniNotUnsigned = -5022,
  kIniNotDouble = -5023,
  kIniNotBoolean = -5024,
};

// Bits of IniSetReadOptions; at first kIniReadDoubleQuotes.
enum IniReadOption : int32_t {
  kIniReadKeepEmpty = 1,     // "key=" is an item with an empty value, not a bad line
  kIniReadDoubleQuotes = 2,  // remove enclosing double quotes
  kIniReadSingleQuotes = 4,  // remove enclosing single quotes
  kIniReadColons = 8,        // ":" and ":=" separate too; items before the first header are kept
};

// Bits of IniSetWriteOptions; at first kIniWriteSafely, kIniWriteUniqueTemporary and
// kIniWriteSpaces.
enum IniWriteOption : int32_t {
  kIniWriteMark = 1,             // begin with the UTF-8 byte order mark
  kIniWriteSafely = 2,           // through a temporary file that is renamed over the target
  kIniWriteUniqueTemporary = 4,  // mkstemp, instead of a sibling whose name ends in "TMP"
  kIniWriteSpaces = 8,           // " = " instead of "="
  kIniWriteTight = 16,           // blank lines around sections that came from no file only
};

enum class IniDurability : int32_t {
  None,         // a process that is killed loses nothing; a power cut may lose the file
  ContentOnly,  // the file's bytes are on disk before the rename: a power cut leaves the old or the new
                // file
  Synced,       // and so is its directory after it: a power cut leaves the new file
};

// Fills `buffer` with at most `maximum` bytes of the present line and a terminator. Sets both flags
// at each call: end of line when the line is complete, end of file when nothing is left. Negative
// results stop the reading.
using IniLineInputFunction = int32_t (*)(void* context, char* buffer, int32_t maximum,
                                         int32_t* endOfFile, int32_t* endOfLine,
                                         int32_t* lineNumber);

// Takes one line without its terminator; negative results stop the writing.
using IniLineOutputFunction = int32_t (*)(void* stream, const char* line);

// ---- Document

// An empty document; null when memory runs out or `reserved` is not 0.
IniStructForwardReferenceTag* IniNew(int reserved);
void IniDispose(IniStructForwardReferenceTag* doc);

// 1 (at first): a repeated name updates the first one; 0: repeats stay separate. Affects later
// reads and puts. Returns the value before.
int32_t IniSetDuplicateChecking(IniStructForwardReferenceTag* doc, int32_t value);

// Replaces the option bits; at first 2 for reading, 14 for writing with a limit of 80. The line
// limit -1 means none; a break character of 0 breaks anywhere.
int32_t IniSetReadOptions(IniStructForwardReferenceTag* doc, int32_t bits);
int32_t IniSetWriteOptions(IniStructForwardReferenceTag* doc, int32_t maxLineLength,
                           int32_t breakCharacter, int32_t bits);

// What IniWriteToFile guarantees when it returns; at first None. Returns the value before.
IniDurability IniSetDurability(IniStructForwardReferenceTag* doc, IniDurability durability);

// ---- Reading. Empties the document first; a failed read leaves what was read so far.

// kIniCannotOpen, kIniUnsupportedEncoding and a failed first allocation leave the document as it
// was. A named pipe, a device, a file of more than 256 MiB and a symbolic link that another user
// may have planted (zt/posix/Files.h) cannot be opened; the call never waits.
int32_t IniReadFromFile(IniStructForwardReferenceTag* doc, const char* path);

// The same from a descriptor that the caller has opened for reading and keeps; from the file's
// beginning, and the descriptor's position stays. The path is the document's file from then on.
int32_t IniReadFromDescriptor(IniStructForwardReferenceTag* doc, const char* path, int fd);
// The same of a stream, from its start, which stays the caller's. kIniReadFailed where the stream
// reports an error: the document then has the lines that were whole.
int32_t ztini_IniReadFromFileHelper(IniStructForwardReferenceTag* doc, FILE* file);
// As a file of these bytes would be read. 0, kIniUnsupportedEncoding or kIniOutOfMemory.
int32_t IniReadBytes(IniStructForwardReferenceTag* doc, const char* bytes, size_t sizeBytes);
// The same line by line, from the caller's own source; null reads nothing. A negative result of the
// source ends the reading and is returned.
int32_t IniRead(IniStructForwardReferenceTag* doc, IniLineInputFunction input, void* context);

// Whole-second modification time; 0, kIniEmptyPath or kIniBadPath.
int32_t IniGetFileTimestamp(const char* path, int64_t* seconds);

// 1 if the file last read or written has another modification time now, older or newer.
int32_t IniIsFileNewer(IniStructForwardReferenceTag* doc);

// ---- Look-up

// 1 or 0. IniFind... return the record, which is valid until it is removed, or null; ...Index its
// position, or 0.
int32_t IniSectionExists(IniStructForwardReferenceTag* doc, const char* section);
int32_t IniItemExists(IniStructForwardReferenceTag* doc, const char* section, const char* item);
IniSection* IniFindSection(IniStructForwardReferenceTag* doc, const char* section);
int32_t IniFindSectionIndex(IniStructForwardReferenceTag* doc, const char* section);
IniEntry* IniFindEntry(IniSection* section, int32_t caseSensitive, const char* item);
int32_t IniFindEntryIndex(IniSection* section, int32_t caseSensitive, const char* item);

// Line of the header, -1 when absent or not from a file.
int32_t IniLineOfSection(IniStructForwardReferenceTag* doc, const char* section);
// The name as stored; null for null.
const char* IniSectionName(const IniSection* section);
const char* IniEntryName(const IniEntry* entry);
// 1 or 0; 0 for null, too.
int32_t IniSectionWasReadFromFile(const IniSection* section);

// 1 for the section of the items before the first header: its name is "(null)".
int32_t IniSectionIsNull(const IniSection* section);

// ---- Enumeration. Names and values stay valid until the item is removed or replaced.

// 0 for what is not there.
int32_t IniNumberOfSections(IniStructForwardReferenceTag* doc);
int32_t IniNumberOfItems(IniStructForwardReferenceTag* doc, const char* section);
// Look-ups of that name go to this very section until another one is looked up.
int32_t IniNthSectionName(IniStructForwardReferenceTag* doc, int32_t n, const char** name);
// Name and value as stored, by position in the section: 1, or 0 where there is none.
int32_t IniNthItemName(IniStructForwardReferenceTag* doc, const char* section, int32_t n,
                       const char** name);
int32_t IniNthItemPointerToString(IniStructForwardReferenceTag* doc, const char* section, int32_t n,
                                  const char** value);

// ---- Structure

// Does not look for another section of the new name.
int32_t IniRenameSection(IniStructForwardReferenceTag* doc, const char* section, const char* name);
// With all of its items. 1 or 0.
int32_t IniRemoveSection(IniStructForwardReferenceTag* doc, const char* section);
int32_t IniRemoveItem(IniStructForwardReferenceTag* doc, const char* section, const char* item);

// ---- Values out. Raw: as stored. Otherwise escape sequences are decoded.

// Both give the stored value; IniGet also remembers the item's line.
int32_t IniGet(IniStructForwardReferenceTag* doc, const char* section, const char* item,
               const char** value);
int32_t IniGetPointerToRawString(IniStructForwardReferenceTag* doc, const char* section,
                                 const char* item, const char** value);
// Valid until the next call that decodes.
int32_t IniGetPointerToString(IniStructForwardReferenceTag* doc, const char* section,
                              const char* item, const char** value);

// Cuts the value to `size` - 1 bytes; "" when absent.
int32_t IniGetRawStringIntoBuffer(IniStructForwardReferenceTag* doc, const char* section,
                                  const char* item, char* buffer, uint32_t size);
int32_t IniGetStringIntoBuffer(IniStructForwardReferenceTag* doc, const char* section,
                               const char* item, char* buffer, uint32_t size);

// A new text to be freed with free().
int32_t IniGetRawStringCopy(IniStructForwardReferenceTag* doc, const char* section,
                            const char* item, char** copy);
int32_t IniGetStringCopy(IniStructForwardReferenceTag* doc, const char* section, const char* item,
                         char** copy);

// 0 when absent or blank; the negative status of the type when malformed.
int32_t IniGetBoolean(IniStructForwardReferenceTag* doc, const char* section, const char* item,
                      int32_t* value);
int32_t IniGetUInt(IniStructForwardReferenceTag* doc, const char* section, const char* item,
                   uint32_t* value);
int32_t IniGetDouble(IniStructForwardReferenceTag* doc, const char* section, const char* item,
                     double* value);

// ---- Values in. A new section goes to the end of the document, a new item to the end of its
// section. White space around a value is dropped; null counts as "". A failed put changes nothing.

// `quoteCharacter` encloses the value in the file; 0 for none.
int32_t IniPut(IniStructForwardReferenceTag* doc, const char* section, const char* item,
               const char* value, int32_t quoteCharacter);
// With `quote` in double quotes; with `escape` the value is encoded first. IniPutRawString quotes
// and does not encode; IniPutDouble writes "%.14e" without quotes.
int32_t IniPutStringWithOptions(IniStructForwardReferenceTag* doc, const char* section,
                                const char* item, const char* value, int32_t quote, int32_t escape);
int32_t IniPutRawString(IniStructForwardReferenceTag* doc, const char* section, const char* item,
                        const char* value);
int32_t IniPutDouble(IniStructForwardReferenceTag* doc, const char* section, const char* item,
                     double value);

// ---- Writing. Leaves the document as it is, but for the file's path and time.

// With kIniWriteSafely a failure leaves the target exactly as it was, and the new file has the old
// one's mode, owner and group. The exception: with IniDurability::Synced the new file is in place
// although kIniWriteFailed is returned, where its directory could not be synced. Without it a
// failed write deletes the target. Never waits for a named pipe; targets other than regular files
// are refused.
int32_t IniWriteToFile(IniStructForwardReferenceTag* doc, const char* path);

// Distinguishes states of a file without reading it: device, inode, size and time of the last
// change.
struct IniFileState {
  uint64_t device = 0, inode = 0;
  int64_t sizeBytes = -1, modifiedSeconds = 0, modifiedNanoseconds = 0;
  bool isKnown() const { return sizeBytes >= 0; }
  bool operator==(const IniFileState&) const = default;
};
IniFileState IniFileStateOf(const struct stat& status);

// Takes all bytes of a file that is about to be put in place. So many of them at least, from the
// first, are as they were in the document's last save, or, at the first one, in the file that it was
// read from; 0 where that is not known.
using IniTextFunction = void (*)(void* context, const char* text, size_t sizeBytes,
                                 size_t unchangedBytes);

// IniWriteToFile for a caller who goes on with what was written: passes the bytes on, if `seen` is
// not null, and sets *written to the state of the file. That stays unknown on a failure, and where
// the path already leads to another file.
int32_t IniWriteToFileAndTell(IniStructForwardReferenceTag* doc, const char* path,
                              IniTextFunction seen, void* context, IniFileState* written);

// ---- Settled documents. Reading back a file that was written can change the document: pieces of a
// value are joined, a line feed in a value breaks the line, an empty value goes. A settled document
// is one that is known not to change. It need not be read back.

// 1 if the document is settled under the locale in force: all of its names and values come from a
// file, or were put and survive the way there and back. 0 is always safe to answer.
int32_t IniIsSettled(IniStructForwardReferenceTag* doc);

// After a settled document was written: does what reading the file back would do, that is, gives
// all sections and items their lines.
void IniTakeAsRead(IniStructForwardReferenceTag* doc);

// The byte order mark, if asked for, and the text; flushes.
int32_t ztini_IniWriteToFileHelper(IniStructForwardReferenceTag* doc, FILE* file);
int32_t IniWrite(IniStructForwardReferenceTag* doc, IniLineOutputFunction output, void* stream);
// The IniLineOutputFunction of a FILE.
int32_t IniFileOutputFunc(void* file, const char* line);
// The text as it is; kIniWriteFailed if not all of it could be written.
int32_t ztini_WriteStringToFile(FILE* file, const char* text);

// Syncs a file that was written without IniDurability::Synced, and its directory, so that many
// saves can share the wait of one. 0, kIniBadPath or kIniWriteFailed.
int32_t ztini_SyncFile(const char* path);

// Does nothing if there is none; reports nothing.
void ztini_RemoveFileIfExists(const char* path);
