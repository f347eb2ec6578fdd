// Rows 1 to 5: documents, look-ups, saves.
#include <fcntl.h>
#include <glib.h>
#include <ini.h>
#include <sys/file.h>
#include <unistd.h>

#include <memory>
#include <memory_resource>
#include <string_view>
#include <unordered_map>

#include "bench/peers/Contest.h"
#include "bench/peers/Parts.h"
#include "source/Utilities/vltjar.h"
#include "zt/fnd/String.h"
#include "ztini/ztini.h"

namespace peers {
namespace {

struct Dispose {
  void operator()(IniStructForwardReferenceTag* doc) const { IniDispose(doc); }
  void operator()(GKeyFile* file) const { g_key_file_free(file); }
};
using Document = std::unique_ptr<IniStructForwardReferenceTag, Dispose>;
using KeyFile = std::unique_ptr<GKeyFile, Dispose>;

// With the options that the guarded files use.
Document Parse(const std::string& path) {
  Document doc(IniNew(0));
  IniSetReadOptions(doc.get(), 22);
  IniSetWriteOptions(doc.get(), -1, 32, 26);
  Require(IniReadFromFile(doc.get(), path.c_str()) == 0, "IniReadFromFile");
  return doc;
}

KeyFile ParseKeys(const std::string& path) {
  KeyFile file(g_key_file_new());
  Require(g_key_file_load_from_file(file.get(), path.c_str(), G_KEY_FILE_KEEP_COMMENTS, nullptr),
          "g_key_file_load_from_file");
  return file;
}

int Ignore(void*, const char*, const char*, const char*) { return 1; }

void RunParsing(const char* row, int sections, double aim) {
  std::string path = Place() + "/parse.ini";
  Replace(path, IniText(sections));
  std::vector<Rival> rivals{{"GKeyFile", aim, [=] { ParseKeys(path); }}};
  if (sections == 1000) {
    rivals.push_back({"inih, no document", 0.25,
                      [=] { Require(ini_parse(path.c_str(), Ignore, nullptr) == 0, "inih"); }});
  }
  Run({row,
       "parse " + std::to_string(sections) + " sections, and free",
       [=] { Parse(path); },
       rivals,
       {},
       sections > 10000 ? 5 : 15});
}

// Names to values in the case that they have, as std has it: what a look-up in two tables costs
// that folds no case, asks for no locale and may be slowed down by names made to collide. The nodes
// lie in few blocks, which leave the heap as it was.
using Items = std::pmr::unordered_map<std::string_view, const char*>;
using Tables = std::pmr::unordered_map<std::string_view, Items>;

Tables TablesOf(IniStructForwardReferenceTag* doc, std::pmr::memory_resource* memory) {
  Tables tables(memory);
  for (int i = 1; i <= IniNumberOfSections(doc); ++i) {
    const char *section = nullptr, *item = nullptr, *value = nullptr;
    IniNthSectionName(doc, i, &section);
    Items& items = tables[section];
    for (int k = 1; k <= IniNumberOfItems(doc, section); ++k) {
      IniNthItemName(doc, section, k, &item);
      IniNthItemPointerToString(doc, section, k, &value);
      items[item] = value;
    }
  }
  return tables;
}

void RunLookUps(int sections) {
  std::string path = Place() + "/find.ini";
  Replace(path, IniText(sections));
  Document doc = Parse(path);
  KeyFile keys = ParseKeys(path);
  std::pmr::monotonic_buffer_resource memory;
  const Tables tables = TablesOf(doc.get(), &memory);
  std::vector<std::pair<std::string, std::string>> questions;
  uint64_t random = 1;
  for (int i = 0; i < 4096; ++i) {
    random = random * 6364136223846793005u + 1442695040888963407u;
    questions.push_back({"Component " + std::to_string((random >> 33) % uint64_t(sections)),
                         "Attribute" + std::to_string((random >> 60) % 10)});
  }
  Run({"3",
       "4,096 look-ups in " + std::to_string(sections) + " sections",
       [&] {
         for (const auto& [section, item] : questions) {
           const char* value = nullptr;
           Require(IniGetPointerToRawString(doc.get(), section.c_str(), item.c_str(), &value) == 1,
                   "a look-up");
         }
       },
       {{"GKeyFile", 0.5,
         [&] {
           for (const auto& [section, item] : questions) {
             char* value = g_key_file_get_value(keys.get(), section.c_str(), item.c_str(), nullptr);
             Require(value != nullptr, "a look-up of theirs");
             g_free(value);
           }
         }},
        {"std::unordered_map", 0, [&] {
           for (const auto& [section, item] : questions) {
             Require(tables.find(section)->second.find(item)->second != nullptr, "std's look-up");
           }
         }}}});
}

void RunSave() {
  std::string path = Place() + "/save.ini", text = IniText(1000);
  Replace(path, text);
  Document doc = Parse(path);
  KeyFile keys = ParseKeys(path);
  int n = 0;
  Run({"4",
       "change one value and save, 1,000 sections",
       [&] {
         IniPutStringWithOptions(doc.get(), "Component 500", "Attribute3",
                                 std::to_string(++n).c_str(), 1, 1);
         Require(IniWriteToFile(doc.get(), path.c_str()) == 0, "IniWriteToFile");
       },
       {{"GKeyFile", 0.18,
         [&] {
           g_key_file_set_string(keys.get(), "Component 500", "Attribute3",
                                 std::to_string(++n).c_str());
           gsize size = 0;
           char* data = g_key_file_to_data(keys.get(), &size, nullptr);
           Replace(path, std::string(data, size));
           g_free(data);
         }},
        {"write and rename", 1.25, [&] { Replace(path, text); }}}});
}

// What the protocol of a guarded file needs at least: lock, both files read, digests, both written.
template <class Change>
void GuardedCycle(const std::string& path, Change change) {
  int lock = open((path + ".lock").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666);
  Require(lock >= 0 && flock(lock, LOCK_EX) == 0, "flock");
  std::string text = ReadFile(path), sidecar = path + ".md5";
  Require(Md5(text) == ReadFile(sidecar), "their digest");
  text = change(text);
  Replace(path, text);
  WriteSidecar(sidecar, Md5(text));
  close(lock);
}

std::string ChangeKeys(const std::string& text, int n) {
  KeyFile keys(g_key_file_new());
  Require(g_key_file_load_from_data(keys.get(), text.data(), text.size(), G_KEY_FILE_KEEP_COMMENTS,
                                    nullptr),
          "g_key_file_load_from_data");
  g_key_file_set_string(keys.get(), "Component 500", "Attribute3", std::to_string(n).c_str());
  gsize size = 0;
  char* data = g_key_file_to_data(keys.get(), &size, nullptr);
  std::string changed(data, size);
  g_free(data);
  return changed;
}

void RunGuardedCycle() {
  std::string ours = Place() + "/guarded.ini", theirs = Place() + "/theirs.ini",
              bare = Place() + "/bare.ini", text = IniText(1000);
  for (const std::string& path : {theirs, bare}) {
    Replace(path, text);
    WriteSidecar(path + ".md5", Md5(text));
  }
  Replace(ours, text);
  zt::fnd::String name(ours.c_str());
  int n = 0;
  auto cycle = [&] {
    std::unique_ptr<CvlIniMgr> ini;
    Require(VltjarOpen(name.c_str(), &ini) >= 0 && ini, "VltjarOpen");
    ini->SetItem("Component 500", "Attribute3", std::to_string(++n).c_str(), true);
    Require(VltjarSaveChanges(name.c_str(), ini.get()) == S_OK, "VltjarSaveChanges");
  };
  cycle();
  Run({"5",
       "guarded cycle, 1,000 sections",
       cycle,
       {{"GKeyFile composed", 0.4,
         [&] {
           GuardedCycle(theirs, [&](const std::string& was) { return ChangeKeys(was, ++n); });
         }},
        {"the system's work", 1.6,
         [&] { GuardedCycle(bare, [](const std::string& was) { return was; }); }}}});
}

}  // namespace

void RunIni() {
  RunParsing("1", 1000, 0.15);
  RunParsing("2", 100000, 0.17);
  RunLookUps(1000);
  RunLookUps(100000);
  RunSave();
  RunGuardedCycle();
}

}  // namespace peers
