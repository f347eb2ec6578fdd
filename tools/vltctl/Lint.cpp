// lint: what is wrong with registration files before they are installed.
//
// Each file is read by its lines, so that a finding has its place. What the library makes of a file is
// in docs/registration-database.md; docs/component-authors.md explains it from the author's side.
#include <algorithm>
#include <cctype>
#include <filesystem>
#include <map>
#include <set>

#include "source/Database/databaseText.h"
#include "source/Database/recordText.h"
#include "tools/common/IniLines.h"
#include "tools/common/Progress.h"
#include "tools/vltctl/Library.h"
#include "tools/vltctl/Reading.h"
#include "vlloader/source/InstallLayout.h"
#include "vlloader/source/vlloader.h"

namespace admin {
namespace {

namespace fs = std::filesystem;
using vltctl::IniLine;
using vltctl::SameName;

constexpr const char* kRegistrationFile = "Resources/Info.vlr";
constexpr size_t kLongestValue = 1023;  // what readers of the database make space for
constexpr const char* kBuiltInIdentifier = "790F6A90-E0D8-11D3-AA15-005004D131EE";
constexpr const char* kNullIdentifier = "00000000-0000-0000-0000-000000000000";

enum class Level { Warning, Error };

struct Finding {
  Level level;
  std::string code, text, next;
};

struct Tally {
  size_t errors = 0, warnings = 0, files = 0;
};

// Identifiers that were met so far, without braces and in upper case, and where.
using Taken = std::map<std::string, std::string>;

bool IsNumber(const std::string& text) {
  return !text.empty() && text.size() <= 10 &&
         std::all_of(text.begin(), text.end(), [](unsigned char c) { return isdigit(c); });
}

// Whether the bytes are UTF-8 throughout.
bool IsUtf8(const std::string& bytes) {
  try {
    // The writer checks what it is given.
    nlohmann::json(bytes).dump();
    return true;
  } catch (const nlohmann::json::type_error&) {
    return false;  // which is the answer
  }
}

bool IsUtf16Or32(const std::string& bytes) {
  return bytes.starts_with("\xFF\xFE") || bytes.starts_with("\xFE\xFF") ||
         bytes.starts_with(std::string("\0\0\xFE\xFF", 4));
}

std::vector<std::string> Fields(const std::string& text) {
  std::vector<std::string> fields(1);
  for (char c : text) {
    if (c == ':') {
      fields.emplace_back();
    } else {
      fields.back() += c;
    }
  }
  return fields;
}

// ---- Keys

enum class Use { Any, Dictionary, Expert, ResourceExpert, Registrar };
struct Key {
  const char* name;
  Use use;
};
constexpr Key kKeys[] = {{registrar::kIdentifier, Use::Any},
                         {registrar::kFileName, Use::Any},
                         {registrar::kSchemaVersion, Use::Dictionary},
                         {registrar::kPrefix, Use::Dictionary},
                         {registrar::kPnp, Use::ResourceExpert},
                         {registrar::kBindingClasses, Use::Expert},
                         {registrar::kFragmentRegistered, Use::Registrar},
                         {registrar::kLastInstalledSchemaVersion, Use::Registrar}};

const Key* FindKey(const std::string& name) {
  for (const Key& key : kKeys) {
    if (SameName(name, key.name)) return &key;
  }
  return nullptr;
}

std::vector<std::string> KeyNames() {
  std::vector<std::string> names;
  for (const Key& key : kKeys) names.push_back(key.name);
  return names;
}

// ---- One file

class Linter {
 public:
  Linter(const std::string& file, Taken* taken, Tally* tally, Output& output)
      : m_file(file), m_taken(*taken), m_tally(*tally), m_output(output) {}

  void run();

 private:
  void say(size_t line, Level level, const char* code, const std::string& text,
           const std::string& next = "");
  void error(const IniLine& line, const char* code, const std::string& text,
             const std::string& next = "") {
    say(line.number, Level::Error, code, text, next);
  }
  void warn(const IniLine& line, const char* code, const std::string& text,
            const std::string& next = "") {
    say(line.number, Level::Warning, code, text, next);
  }

  void lintBytes(const std::string& bytes);
  void lintLines();
  void lintRepeats();
  void lintList();
  void lintEntry(const IniLine& entry);
  void lintUnlisted();
  void lintComponent(const IniLine& header, const std::string& name);
  void lintKeys(const std::string& name, bool isDictionary, bool isResource);
  void lintIdentifier(const IniLine& header, const std::string& name);
  void lintBindings(const IniLine& line, const std::string& identifier);
  void lintFile(const IniLine& header, const std::string& name, bool isDictionary, bool isResource);
  void lintLibrary(const IniLine& line, const std::string& bundle, const char* entry);

  const IniLine* item(const std::string& section, const char* name) const {
    return vltctl::FindItem(m_lines, section, name);
  }
  const IniLine* header(const std::string& section) const;

  const std::string m_file;
  Taken& m_taken;
  Tally& m_tally;
  Output& m_output;
  std::vector<IniLine> m_lines;
};

void Linter::say(size_t line, Level level, const char* code, const std::string& text,
                 const std::string& next) {
  bool isError = level == Level::Error;
  ++(isError ? m_tally.errors : m_tally.warnings);
  m_output.line(m_file + ":" + std::to_string(line) + ": ", isError ? "error" : "warning",
                isError ? vltctl::Mood::Bad : vltctl::Mood::Doubtful,
                ": " + text + (next.empty() ? "" : "; " + next));
  m_output.item({{"file", m_file},
                 {"line", line},
                 {"level", isError ? "error" : "warning"},
                 {"code", code},
                 {"text", text},
                 {"next", next.empty() ? vltctl::Json() : vltctl::Json(next)}});
}

const IniLine* Linter::header(const std::string& section) const {
  auto found = std::find_if(m_lines.begin(), m_lines.end(), [&](const IniLine& line) {
    return line.kind == IniLine::Kind::Header && SameName(line.section, section);
  });
  return found == m_lines.end() ? nullptr : &*found;
}

void Linter::lintBytes(const std::string& bytes) {
  if (!IsUtf8(bytes)) {
    say(1, Level::Error, "not-utf8",
        "the file is not UTF-8, so names differ by the reader's locale", "save it as UTF-8");
  }
  if (m_file.find('=') != std::string::npos) {
    say(1, Level::Warning, "equals-in-path",
        "the path contains \"=\", so every start merges the file again", "rename the bundle");
  }
}

void Linter::lintLines() {
  for (const IniLine& line : m_lines) {
    if (line.kind == IniLine::Kind::Bad) {
      error(line, "bad-line", "\"" + line.text + "\" is neither a section nor a key with a value");
    } else if (line.kind == IniLine::Kind::Item && line.section.empty()) {
      error(line, "no-section", line.name + " is above the first section and is ignored");
    } else if (line.value.size() > kLongestValue) {
      error(line, "too-long",
            "the value of " + line.name + " has " + std::to_string(line.value.size()) +
                " bytes, more than " + std::to_string(kLongestValue));
    }
  }
}

void Linter::lintRepeats() {
  for (const IniLine& line : m_lines) {
    if (line.kind == IniLine::Kind::Header && header(line.section) != &line) {
      warn(line, "repeated-section",
           "[" + line.section + "] goes on from line " +
               std::to_string(header(line.section)->number));
    }
    if (line.kind != IniLine::Kind::Item) continue;
    const IniLine* counts = vltctl::FindItem(m_lines, line.section, line.name);
    if (counts != &line) {
      error(
          line, "repeated-key",
          line.name + " is ignored, as line " + std::to_string(counts->number) + " sets it again");
    }
  }
}

void Linter::lintEntry(const IniLine& entry) {
  if (entry.name != entry.value) {
    error(entry, "key-and-value-differ",
          "the list entry \"" + entry.name + "\" has the value \"" + entry.value +
              "\": the key names the section, and by the value the component is removed",
          "make them equal");
  }
  if (registrar::IsReserved(entry.name)) {
    error(entry, "reserved-name", "\"" + entry.name + "\" is a section of the database itself",
          "choose another name");
  } else if (SameName(entry.name, registrar::kBuiltInDictionary)) {
    error(entry, "reserved-name", "\"" + entry.name + "\" is the library's own dictionary",
          "choose another name");
  } else if (const IniLine* head = header(entry.name)) {
    lintComponent(*head, entry.name);
  } else {
    error(entry, "no-component", "there is no section [" + entry.name + "]", "add it");
  }
}

void Linter::lintList() {
  const IniLine* list = header(registrar::kComponents);
  if (!list) {
    std::vector<std::string> sections;
    for (const IniLine& line : m_lines) sections.push_back(line.section);
    std::string guess = vltctl::Nearest(registrar::kComponents, sections);
    say(1, Level::Error, "no-list", "there is no section [KORComponents], so nothing is registered",
        guess.empty() ? "add it" : "is [" + guess + "] meant to be it?");
    return;
  }
  bool isEmpty = true;
  for (const IniLine& line : m_lines) {
    bool isEntry = line.kind == IniLine::Kind::Item && SameName(line.section, list->section);
    if (!isEntry || item(list->section, line.name.c_str()) != &line) continue;
    isEmpty = false;
    lintEntry(line);
  }
  if (isEmpty)
    error(*list, "empty-list", "[KORComponents] lists nothing, so nothing is registered");
}

void Linter::lintUnlisted() {
  for (const IniLine& line : m_lines) {
    if (line.kind != IniLine::Kind::Header || SameName(line.section, registrar::kComponents))
      continue;
    if (header(line.section) != &line) continue;
    if (registrar::IsReserved(line.section)) {
      error(line, "reserved-section", "[" + line.section + "] is a section of the database itself",
            "remove it");
    } else if (!item(registrar::kComponents, line.section.c_str())) {
      warn(line, "not-listed", "[" + line.section + "] is not listed in [KORComponents]",
           "add " + line.section + " = \"" + line.section + "\" to the list");
    }
  }
}

void Linter::lintKeys(const std::string& name, bool isDictionary, bool isResource) {
  for (const IniLine& line : m_lines) {
    if (line.kind != IniLine::Kind::Item || !SameName(line.section, name)) continue;
    const Key* key = FindKey(line.name);
    if (!key) {
      std::string guess = vltctl::DidYouMean(line.name, KeyNames());
      if (guess.empty()) {
        warn(line, "unknown-key", line.name + " is kept, and read by nothing");
      } else {
        error(line, "misspelt-key", line.name + " is read by nothing", guess);
      }
    } else if (key->use == Use::Registrar) {
      warn(line, "registrars-key", line.name + " is the registrar's own to set", "remove it");
    } else if ((key->use == Use::Dictionary && !isDictionary) ||
               (key->use == Use::Expert && isDictionary) ||
               (key->use == Use::ResourceExpert && isDictionary)) {
      warn(line, "other-type",
           line.name + " says nothing of " + (isDictionary ? "a dictionary" : "an expert"));
    }
  }
  const IniLine* version = item(name, registrar::kSchemaVersion);
  if (version && !IsNumber(version->value)) {
    error(*version, "bad-number",
          "SchemaVersion is \"" + version->value + "\", which is no number");
  }
}

void Linter::lintIdentifier(const IniLine& head, const std::string& name) {
  const IniLine* line = item(name, registrar::kIdentifier);
  if (!line) {
    error(head, "no-identifier", "[" + name + "] has no Identifier", "add a fresh GUID");
    return;
  }
  std::string guid = vltctl::BareGuid(line->value);
  if (!vltctl::IsGuidText(line->value)) {
    error(*line, "bad-identifier", "Identifier \"" + line->value + "\" is no GUID");
  } else if (guid == kNullIdentifier) {
    error(*line, "null-identifier", "Identifier is the null GUID, which stands for all components");
  } else if (auto [other, isFree] = m_taken.emplace(guid, "[" + name + "] of " + m_file); !isFree) {
    error(*line, "identifier-taken", "Identifier is that of " + other->second, "make a fresh GUID");
  }
}

// {component}:n:{class 1}:...:{class n}, and so on.
void Linter::lintBindings(const IniLine& line, const std::string& identifier) {
  std::vector<std::string> fields = Fields(line.value);
  for (size_t at = 0; at < fields.size();) {
    if (at + 1 >= fields.size() || !IsNumber(fields[at + 1])) {
      error(line, "binding-count", "after \"" + fields[at] + "\" there is no count of classes",
            "write {component}:n:{class}...");
      return;
    }
    size_t count = std::stoull(fields[at + 1]), left = fields.size() - at - 2;
    size_t here = 0;
    while (here < left && vltctl::IsGuidText(fields[at + 2 + here]) &&
           !(at + 3 + here < fields.size() && IsNumber(fields[at + 3 + here]))) {
      ++here;
    }
    if (!vltctl::IsGuidText(fields[at]) || (left > here && here < count)) {
      const std::string& bad = vltctl::IsGuidText(fields[at]) ? fields[at + 2 + here] : fields[at];
      error(line, "binding-guid", "\"" + bad + "\" is no GUID of a class or component here");
      return;
    }
    if (here != count) {
      error(line, "binding-count",
            "the count is " + std::to_string(count) + ", and there are " + std::to_string(here) +
                " classes");
      return;
    }
    if (!identifier.empty() && vltctl::BareGuid(fields[at]) != vltctl::BareGuid(identifier)) {
      warn(line, "binding-other", "the entry is of " + fields[at] + ", not of this component");
    }
    at += 2 + count;
  }
}

void Linter::lintLibrary(const IniLine& line, const std::string& bundle, const char* entry) {
  const std::string library = LibraryIn(bundle), base = fs::path(bundle).stem();
  if (library.empty()) {
    error(line, "no-library",
          "the bundle has none of lib" + base + ".so, " + base + ".so and " + base, "build it");
  } else if (!MayExport(library, entry)) {
    error(line, "no-entry-point", library + " does not export \"" + entry + "\"");
  }
}

void Linter::lintFile(const IniLine& head, const std::string& name, bool isDictionary,
                      bool isResource) {
  const IniLine* line = item(name, registrar::kFileName);
  if (!line) {
    error(head, "no-file-name", "[" + name + "] has no FileName", "add the name of the bundle");
    return;
  }
  fs::path file = line->value, bundle = fs::absolute(fs::path(m_file)).parent_path().parent_path();
  if (!file.has_extension()) file += isDictionary ? ".framework" : ".vle";
  bool isInBundle = m_file.ends_with(kRegistrationFile);
  if (!isInBundle) return;  // A file that lies alone leads nowhere yet.
  if (file.has_parent_path()) {
    warn(*line, "file-name-path", "FileName has a directory, so it holds on this machine only",
         "give the name of the bundle alone");
  } else if (file != bundle.filename()) {
    error(
        *line, "other-bundle",
        "FileName leads to " + file.string() + ", and the bundle is " + bundle.filename().string());
  }
  if (file.filename() != bundle.filename()) return;
  using vlt::snapshot::Type;
  Type type = isDictionary ? Type::Dictionary
              : isResource ? Type::ResourceExpert
                           : Type::ObjectExpert;
  lintLibrary(*line, bundle, EntryPointOf(type));
}

void Linter::lintComponent(const IniLine& head, const std::string& name) {
  bool isDictionary = item(name, registrar::kSchemaVersion);
  bool isResource = !isDictionary && item(name, registrar::kPnp);
  lintKeys(name, isDictionary, isResource);
  lintIdentifier(head, name);
  const IniLine* identifier = item(name, registrar::kIdentifier);
  if (const IniLine* bindings = item(name, registrar::kBindingClasses)) {
    lintBindings(*bindings, identifier ? identifier->value : "");
  }
  if (isDictionary && !item(name, registrar::kPrefix)) {
    warn(head, "no-prefix", "the dictionary [" + name + "] has no Prefix");
  }
  lintFile(head, name, isDictionary, isResource);
}

void Linter::run() {
  ++m_tally.files;
  GuardedBytes read = ReadGuarded(m_file);
  if (read.state != GuardedBytes::State::Read) {
    say(1, Level::Error, "unreadable",
        "the file cannot be read: " + (read.error.empty() ? "it is missing" : read.error));
    return;
  }
  if (IsUtf16Or32(read.bytes)) {
    say(1, Level::Error, "utf16",
        "the file is UTF-16 or UTF-32, and the library sets such files aside", "save it as UTF-8");
    return;
  }
  m_lines = vltctl::LinesOf(read.bytes);
  lintBytes(read.bytes);
  lintLines();
  lintRepeats();
  lintList();
  lintUnlisted();
}

// ---- Which files

void AddBelow(const fs::path& directory, std::vector<std::string>* files) {
  std::error_code gone;
  if (fs::exists(directory / kRegistrationFile, gone)) {
    files->push_back(directory / kRegistrationFile);
    return;
  }
  std::vector<fs::path> below;
  for (fs::directory_iterator entry(directory, gone), end; !gone && entry != end;
       entry.increment(gone)) {
    std::error_code hidden;
    if (fs::is_directory(entry->symlink_status(hidden))) below.push_back(entry->path());
  }
  std::sort(below.begin(), below.end());
  for (const fs::path& path : below) AddBelow(path, files);
}

std::vector<std::string> FilesOf(const std::vector<std::string>& paths) {
  std::vector<std::string> files;
  for (const std::string& path : paths) {
    std::error_code gone;
    size_t before = files.size();
    if (fs::is_directory(path, gone)) {
      AddBelow(path, &files);
    } else {
      files.push_back(path);
    }
    if (files.size() > before) continue;
    throw vltctl::Failure(vltctl::kNotFound,
                          {"no-registration-file", path, "there is no registration file below", "",
                           std::string("a bundle has it as ") + kRegistrationFile});
  }
  return files;
}

// What is installed from elsewhere: a component that is linted in its place does not take its own.
void AddInstalled(const std::vector<std::string>& files, Taken* taken) {
  taken->emplace(kBuiltInIdentifier, "the library's own dictionary");
  if (vlLookUpInstallDirectory().empty()) return;
  Document database(ReadGuarded(InstalledFile(vlt::layout::kDatabase)).bytes);
  std::set<std::string> linted;
  for (const std::string& file : files) {
    for (const IniLine& line : vltctl::LinesOf(ReadGuarded(file).bytes))
      linted.insert(vltctl::BareGuid(line.section));
  }
  for (const std::string& section : database.sections()) {
    auto identifier = database.get(section, registrar::kIdentifier);
    if (identifier && !linted.count(vltctl::BareGuid(section))) {
      taken->emplace(vltctl::BareGuid(*identifier), "[" + section + "], which is installed");
    }
  }
}

std::string Count(size_t count, const std::string& noun) {
  return std::to_string(count) + " " + noun + (count == 1 ? "" : "s");
}

}  // namespace

int Lint(const Arguments& arguments, Output& output) {
  std::vector<std::string> files = FilesOf(arguments.list("PATH"));
  Taken taken;
  AddInstalled(files, &taken);
  Tally tally;
  vltctl::Progress progress("reading", files.size());
  for (const std::string& file : files) {
    Linter(file, &taken, &tally, output).run();
    progress.step();
  }
  output.line(Count(tally.errors, "error") + " and " + Count(tally.warnings, "warning") + " in " +
              Count(tally.files, "file"));
  bool isBad = tally.errors > 0 || (arguments.has("--strict") && tally.warnings > 0);
  return isBad ? vltctl::kNotFound : vltctl::kGood;
}

}  // namespace admin
