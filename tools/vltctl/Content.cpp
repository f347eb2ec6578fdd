#include "tools/vltctl/Content.h"

#include <optional>
#include <set>
#include <vector>

#include "source/Database/databaseText.h"
#include "source/Snapshot/Rehearsal.h"
#include "source/Snapshot/Tree.h"
#include "tools/common/Progress.h"
#include "tools/vltctl/Claims.h"
#include "tools/vltctl/Components.h"
#include "tools/vltctl/Root.h"

namespace admin {
namespace {

using vlt::snapshot::FileState;
using vlt::snapshot::Opened;
using vlt::snapshot::Rehearsal;
using vlt::snapshot::TreeFile;
using vltctl::Json;

// An item that a registration file, which no start reads again, has and the database has not, or has
// with another value.
struct Difference {
  std::string file, section, item;
  std::optional<std::string> inFile, inDatabase;
};

struct Contents {
  unsigned files = 0;  // that were compared: not those that the next start reads
  std::vector<Difference> differences;
};

// What is recorded as brought by a file, by the file's path in the database.
std::map<std::string, std::set<std::string>> RecordedSections(const IniDocument& document) {
  std::map<std::string, std::set<std::string>> sections;
  for (int n = 1; n <= document.GetNumberOfItems(registrar::kContents); ++n) {
    std::string section, file;
    if (document.GetNthItemName(registrar::kContents, n, &section) < 0) continue;
    if (document.GetItem(registrar::kContents, section.c_str(), &file) < 0) continue;
    sections[file].insert(section);
  }
  return sections;
}

void Compare(const std::string& file, const std::string& section, const Items& inFile,
             const Items& inDatabase, std::vector<Difference>* differences) {
  auto in = [](const Items& items, const std::string& item) -> std::optional<std::string> {
    auto found = items.find(item);
    return found == items.end() ? std::nullopt : std::optional(found->second);
  };
  Items all = inFile;
  all.insert(inDatabase.begin(), inDatabase.end());
  for (const auto& [item, value] : all) {
    Difference one{file, section, item, in(inFile, item), in(inDatabase, item)};
    if (one.inFile != one.inDatabase) differences->push_back(one);
  }
}

// One merge after the other into one copy of the database; what differs there is compared once more in
// a copy of its own, as an earlier merge of another file may have changed the section.
class Comparison {
 public:
  explicit Comparison(const Opened& opened)
      : m_opened(opened), m_database(true), m_rehearsal(opened.bytes, opened.place) {
    m_database.Parse(opened.bytes);
    m_recorded = RecordedSections(m_database);
  }

  Contents compare() {
    const std::vector<TreeFile> files = vlt::snapshot::ReadTree(m_opened.place).files;
    vltctl::Progress progress("comparing", files.size());
    for (const TreeFile& file : files) {
      bool isCompared = m_rehearsal.stateOf(file.recorded, file.time) == FileState::Unchanged;
      if (isCompared) {
        ++m_contents.files;
        compare(file);
      }
      progress.step();
    }
    return m_contents;
  }

 private:
  // Those that the database has of the file, and those that the file brings and the database has from
  // nowhere.
  std::set<std::string> sectionsOf(const TreeFile& file) const {
    std::set<std::string> sections;
    auto recorded = m_recorded.find(file.recorded);
    if (recorded != m_recorded.end()) sections = recorded->second;
    const Bundle bundle = BundleAt(m_opened.place.here, file.here);
    for (const Claim& claim : ClaimsOf(bundle)) {
      bool isKnown = m_database.ItemExists(registrar::kContents, claim.key.c_str()) >= 0;
      if (claim.isListed && claim.hasSection && !isKnown) sections.insert(claim.key);
    }
    return sections;
  }

  void compare(const TreeFile& file) {
    m_rehearsal.merge(file.recorded, file.time);
    for (const std::string& section : sectionsOf(file)) {
      Items inDatabase = ItemsOf(m_database, section);
      if (ItemsOf(m_rehearsal.document(), section) == inDatabase) continue;
      Compare(file.here, section, ItemsAfterMerge(m_opened, file.here, section), inDatabase,
              &m_contents.differences);
    }
  }

  const Opened& m_opened;
  IniDocument m_database;
  Rehearsal m_rehearsal;
  std::map<std::string, std::set<std::string>> m_recorded;
  Contents m_contents;
};

Json ValueOf(const std::optional<std::string>& text) { return text ? Json(*text) : Json(); }

std::string Quoted(const std::optional<std::string>& text) {
  return text ? "\"" + *text + "\"" : "nothing";
}

void Show(const Difference& one, Output& output) {
  output.item({{"file", one.file},
               {"section", one.section},
               {"key", one.item},
               {"inFile", ValueOf(one.inFile)},
               {"inDatabase", ValueOf(one.inDatabase)}});
  output.line(one.file + ": ", "[" + one.section + "] " + one.item, vltctl::Mood::Bad,
              ": the file has " + Quoted(one.inFile) + ", the database " + Quoted(one.inDatabase));
}

}  // namespace

Items ItemsOf(const IniDocument& document, const std::string& section) {
  Items items;
  for (int n = 1; n <= document.GetNumberOfItems(section.c_str()); ++n) {
    std::string item, value;
    if (document.GetNthItemName(section.c_str(), n, &item) < 0) continue;
    document.GetItem(section.c_str(), item.c_str(), &value);
    if (item != registrar::kFragmentRegistered) items[item] = value;
  }
  return items;
}

Items ItemsAfterMerge(const Opened& opened, const std::string& file, const std::string& section) {
  Rehearsal rehearsal(opened.bytes, opened.place);
  for (const TreeFile& one : vlt::snapshot::ReadTree(opened.place).files) {
    if (one.here == file) rehearsal.merge(one.recorded, one.time);
  }
  return ItemsOf(rehearsal.document(), section);
}

int VerifyContent(const Arguments& arguments, Output& output) {
  if (arguments.has("--all") || !arguments.list("FILE").empty()) {
    throw vltctl::Failure(vltctl::kUsage, {"usage", "", "--content goes without --all and files",
                                           "it is about all registration files", ""});
  }
  ReadComponents(output);  // ends here where the database cannot be used
  Contents contents;
  WithFailures([&] {
    contents = vlt::snapshot::WithStandardErrors([] {
      Opened opened = HasChosenRoot() ? vlt::snapshot::OpenAt(InstallDirectory())
                                      : vlt::snapshot::OpenInForce();
      return Comparison(opened).compare();
    });
  });
  for (const Difference& one : contents.differences) Show(one, output);
  const bool isGood = contents.differences.empty();
  if (!isGood) {
    output.line("a start compares times alone: touch these files, and the next one reads them");
  }
  output.line(Plural(contents.files, "registration file") + " compared: " +
              (isGood ? "the database has what they say"
                      : Plural(static_cast<unsigned>(contents.differences.size()), "difference")));
  return isGood ? vltctl::kGood : vltctl::kNotFound;
}

}  // namespace admin
