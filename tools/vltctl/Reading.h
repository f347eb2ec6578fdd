#pragma once

#include <sys/types.h>

#include <functional>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "tools/common/Arguments.h"
#include "tools/common/Output.h"
#include "zt/posix/ScopedFd.h"
#include "ztini/ztini.h"

// Reading shared files without taking part: without a lock, and without making or changing anything.
namespace admin {

// No file of an installation comes near this size; a larger one was made to exhaust the reader.
inline constexpr size_t kFileLimit = size_t{256} << 20;
inline constexpr const char* kTooLarge =
    "it is larger than 256 MiB, which no file of an installation is";

// The file for reading, if it is a regular one that the library opens too (zt/posix/Files.h): a pipe is not
// waited for, a device not touched, a link of another user not followed. Invalid otherwise, with errno and
// why in *error.
zt::posix::ScopedFd OpenRegular(const std::string& file, std::string* error);
std::string WhyNotOpened(int error);

// Reads a guarded file, and again if another process has written it or its sidecar in between; at most
// twenty times.
void ReadBetweenSaves(const std::string& file, const std::function<void()>& read);

// A guarded file as it was at one moment.
struct GuardedBytes {
  enum class State { Missing, Unreadable, Read };
  State state = State::Missing;
  std::string error;  // why it is unreadable
  std::string bytes;
};

// A file beyond kFileLimit is unreadable.
GuardedBytes ReadGuarded(const std::string& file);

// A document read from bytes, and its status (ztini.h).
class Document {
 public:
  explicit Document(const std::string& bytes);
  ~Document() { IniDispose(m_document); }
  Document(const Document&) = delete;
  Document& operator=(const Document&) = delete;

  int32_t status() const { return m_status; }
  std::optional<std::string> get(const std::string& section, const std::string& item) const;
  std::vector<std::string> sections() const;
  std::vector<std::pair<std::string, std::string>> items(const std::string& section) const;
  IniStructForwardReferenceTag* handle() const { return m_document; }

 private:
  IniStructForwardReferenceTag* m_document;
  int32_t m_status;
};

// <install>/Data/NAME.
std::string DataFile(const std::string& name);
// Path of a file or directory of the installation (vlloader/source/InstallLayout.h).
std::string InstalledFile(const wchar_t* name);

// The file that sets the preference "Dir"; where none does, the first that could.
std::string PreferenceFile();

// A place of the installation or the machine, and what decides it. The path is empty for none.
struct Place {
  std::string name, path, origin;
};
std::vector<Place> Places();

// A name with its value and where that comes from.
struct Row {
  std::string name, value, origin;
};
// Prints them as a table, and as items {"name", "value", "origin"}.
void Print(const std::vector<Row>& rows, vltctl::Output& output);

// "2026-01-31T23:59:59Z".
std::string UtcText(time_t time);

// The preference "Dir" is empty.
vltctl::Failure NoInstallDirectory();

// The file cannot be used, for the reason that reading it gave.
vltctl::Failure Unusable(const std::string& file, const std::string& why);

using vltctl::Arguments;
using vltctl::Output;

// ---- The commands.
int List(const Arguments& arguments, Output& output);
int Show(const Arguments& arguments, Output& output);
int Classes(const Arguments& arguments, Output& output);
int Scan(const Arguments& arguments, Output& output);
int Why(const Arguments& arguments, Output& output);
int Watch(const Arguments& arguments, Output& output);
int CheckImage(const Arguments& arguments, Output& output);
int Settings(const Arguments& arguments, Output& output);
int SettingsSet(const Arguments& arguments, Output& output);
int Url(const Arguments& arguments, Output& output);
int Identity(const Arguments& arguments, Output& output);
int Jar(const Arguments& arguments, Output& output);
int Verify(const Arguments& arguments, Output& output);
int Repair(const Arguments& arguments, Output& output);
int Trace(const Arguments& arguments, Output& output);
int Events(const Arguments& arguments, Output& output);
int HookList(const Arguments& arguments, Output& output);
int HookArm(const Arguments& arguments, Output& output);
int HookClear(const Arguments& arguments, Output& output);
int Error(const Arguments& arguments, Output& output);
int Paths(const Arguments& arguments, Output& output);
int Locks(const Arguments& arguments, Output& output);
int Doctor(const Arguments& arguments, Output& output);
int Lint(const Arguments& arguments, Output& output);
int New(const Arguments& arguments, Output& output);
int Completion(const Arguments& arguments, Output& output);

}  // namespace admin
