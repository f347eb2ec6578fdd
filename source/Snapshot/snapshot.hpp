#pragma once

// What is installed, read without taking part.
//
// The registrar of the library holds its database's lock for the life of its process, and writes. A
// program that only looks reads a snapshot: no lock, nothing made, written or loaded, no mode
// changed. It also works on a tree that may only be read, and on the image of another machine.
//
// Texts are UTF-8. The process's C locale is the encoding of the files, as it is for the library:
// what cannot be converted is "?". Threads: any, each with objects of its own.
//
//   for (const auto& c : vlt::snapshot::Read().components) std::cout << c.name << "\n";

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace vlt::snapshot {

enum class Type { Dictionary, ObjectExpert, ResourceExpert };

// "dictionary", "object expert", "resource expert".
const char* NameOf(Type type);

// A component as GetComponent and EnumComponents of the registrar give it. Texts that are null
// there are none here.
struct Component {
  Type type = Type::ObjectExpert;
  std::string name;
  std::string guid;  // "{38 characters}", upper case; all zeros for a missing or bad one
  std::optional<std::string> file;
  std::uint32_t recordVersion = 0;
  // Dictionaries. fragmentRegistered is not 0 for one that was merged and not yet acknowledged.
  std::uint32_t schemaVersion = 0, fragmentRegistered = 0, lastInstalledSchemaVersion = 0xFFFFFFFF;
  std::optional<std::string> prefix;
  // Resource experts.
  std::optional<std::string> pnp;

  // Experts: the classes it binds to, once each.
  std::vector<std::string> classes;

  std::string registrationFile;  // which brought it; empty for one that came by a call
};

// An expert that binds to a class.
struct Binding {
  Type type = Type::ObjectExpert;
  std::string bindingClass, component;  // GUIDs
};

enum class DatabaseState {
  Missing,           // the next registrar makes it, and registers all
  Sound,             // the digest matches
  DigestDiffers,     // taken as it is; a save repairs the sidecar
  SidecarMissing,    // taken as it is
  SidecarDirectory,  // the next registrar sets both aside and answers nothing
  SidecarShort,      // the same
  Unparsable,        // the next registrar sets the database aside and registers all again
  Unreadable,        // the system refuses; `error` says why
};

struct Database {
  std::string path;
  DatabaseState state = DatabaseState::Missing;
  std::string failedPath;  // for Unreadable: the database or its sidecar
  int error = 0;           // errno of it
  // The second name, left by a scan that did not finish, counts: it is what was read.
  bool readFromDurableCopy = false;
};

enum class FileState {
  Unchanged,
  New,       // the database has no time stamp of it
  Changed,   // it has another one
  Vanished,  // the file is gone, and components of it are recorded
};

// A registration file: of the tree, in the order of a scan, or recorded in the database.
struct RegistrationFile {
  std::string path;  // as it is here, below the root that was given
  FileState state = FileState::Unchanged;
};

// A directory that could not be read.
struct Problem {
  std::string path;
  int error = 0;
};

// The answers of a registrar that starts now and finds no registration file new or changed. None
// where it would not begin with what the database holds: where that is missing, set aside or
// unreadable.
struct Snapshot {
  std::string root;          // ends in a slash
  std::string recordedRoot;  // what it was when the database was written; ends in a slash
  Database database;
  std::vector<Component> components;  // in the order of their GUIDs
  std::vector<Binding> bindings;      // in the order of their entry
  std::vector<RegistrationFile> files;
  std::vector<std::string> previousDictionaries;
  std::vector<Problem> problems;
  // Settings.
  std::uint32_t schemaVersion = 0, cacheSizeBytes = 0x2000000;
  std::optional<std::string> configurationFile;

  // Null if there is none. The GUID in any form.
  const Component* find(const std::string& guid) const;
  // What GetComponentsForBindingClass answers: GUIDs, repeats included.
  std::vector<std::string> boundTo(Type type, const std::string& bindingClass) const;
  // How many files are not Unchanged.
  unsigned changes() const;
};

// Of the installation in force: the preference "Dir", looked up once a process as by the library.
// Throws std::runtime_error where that names none, std::system_error where the system cannot read
// it now, std::bad_alloc.
Snapshot Read();

// Of the installation in a directory. Its database may have been written where the installation had
// another path, on another machine say: recorded paths below that are taken for paths below `root`.
Snapshot Read(const std::string& root);

// ---- What the next start of a registrar would do.

// An item of the database. None for one that is not there.
struct ItemChange {
  std::string section, item;
  std::optional<std::string> before, after;
};

struct Start {
  std::string root;
  Database database;
  // False where the registrar does not scan: the database cannot be opened, or is set aside and
  // nothing answered until the start after this one. `files` is all there is then.
  bool scans = false;
  std::vector<RegistrationFile> files;  // in the order of the scan; at last those that vanished
  std::vector<std::string> setAside;    // registration files that cannot be parsed
  std::vector<std::string>
      skipped;  // new or changed ones that cannot be read: they stay as they are
  // Listed components, by their names.
  std::vector<Component> added, removed, changed;
  std::vector<ItemChange> items;
  unsigned saves = 0;
  // What the start erases reaches the disk with the next save only.
  bool leavesErasedOnDisk = false;
  std::string text;  // the bytes of the database after it
  std::vector<Problem> problems;
};

// As Read.
Start RehearseStart();
Start RehearseStart(const std::string& root);

// The text form with braces, in upper case; nothing for a text that is no GUID.
std::optional<std::string> ParseGuid(const std::string& text);

}  // namespace vlt::snapshot
