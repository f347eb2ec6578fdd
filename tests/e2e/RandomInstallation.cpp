#include "tests/e2e/RandomInstallation.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <system_error>

#include "tests/support/RegistrarClient.h"

namespace vlt::test {

namespace fs = std::filesystem;

namespace {

const std::vector<const char*> kNames = {"Core",
                                         "Tank",
                                         "tank",
                                         "Serial Ports",
                                         "Gr\xC3\xB6\xC3\x9F"
                                         "e",
                                         "\xE6\x97\xA5\xE6\x9C\xAC",
                                         "a\\tb",
                                         "x Line0001",
                                         "long Line0001",
                                         "long Line0002",
                                         "Quote'd",
                                         "KOR",
                                         "Registration",
                                         "vltdd",
                                         "\xFFnot UTF-8",
                                         "semi;colon",
                                         "back\\\\slash"};
const std::vector<const char*> kBundles = {"A",
                                           "B",
                                           "C",
                                           "With Space",
                                           "d.e",
                                           "Gr\xC3\xB6\xC3\x9F"
                                           "e",
                                           "equal=sign",
                                           ".hidden",
                                           "[x]",
                                           "UPPER",
                                           "quote\"d",
                                           "\xFF"};
const std::vector<const char*> kFiles = {"One", "two.vle",       "sub/Three",   "/opt/Four.vle", "",
                                         "ONE", "/x/Last/y.vle", "back\\slash", "O\xC3\x96"};

}  // namespace

RandomInstallation::RandomInstallation(unsigned seed) : m_random(seed) {
  for (unsigned n = any(9); n > 0; --n) addAny();
}

std::string RandomInstallation::guid() {
  if (oneIn(12)) return oneOf({"", "no guid", "00000000-0000-0000-0000-000000000000", "{}"});
  std::string text = GText(any(kIdentifiers));
  return oneIn(3) ? "{" + text + "}" : text;
}

std::string RandomInstallation::bindingClasses() {
  if (oneIn(10)) return oneOf({":", "x:1", "::::", "{}:1:{}", "a:99999999999:b"});
  std::string text;
  for (unsigned entries = 1 + any(3); entries > 0; --entries) {
    unsigned classes = any(4);
    text += (text.empty() ? "" : ":") + guid() + ":" + std::to_string(classes);
    for (; classes > 0; --classes) text += ":" + guid();
  }
  return text;
}

std::string RandomInstallation::value(const std::string& text) {
  if (oneIn(8)) return " = '" + text + "'\n";
  return (oneIn(4) ? "=" : " = ") + ("\"" + text + "\"\n");
}

std::string RandomInstallation::section(const std::string& name, bool isDictionary) {
  std::string text = "[" + name + "]\n";
  if (!oneIn(12)) text += "Identifier" + value(guid());
  std::string file = oneIn(8) ? root() + "/Data Dictionaries/Last/One.vle" : oneOf(kFiles);
  if (!oneIn(12)) text += "FileName" + value(file);
  if (isDictionary != oneIn(10)) {
    text +=
        "SchemaVersion = " + std::string(oneOf({"7", "\"8\"", "0", "text", "4294967296"})) + "\n";
    if (!oneIn(3)) text += "Prefix" + value(oneOf({"p", "", "\xC3\xA4", "a\\nb"}));
    if (oneIn(3)) text += "LastInstalledSchemaVersion = " + std::to_string(any(9)) + "\n";
    if (oneIn(8)) text += "FragmentRegistered = 5\n";
  }
  if (oneIn(3)) text += "PnP" + value(oneOf({"PNP0501", "", "PCI\\\\VEN_1", "\xC3\xA4"}));
  if (!oneIn(3)) text += "BINDING_CLASSES" + value(bindingClasses());
  if (oneIn(4)) text += "Further" + value("kept \\x41 ; as it is");
  return text;
}

std::string RandomInstallation::registration(bool isDictionary) {
  if (oneIn(25)) return std::string("\xFF\xFE[\0a\0]\0", 8);
  if (oneIn(25)) return "";
  std::string list = "[KORComponents]\n", sections;
  if (oneIn(10)) list = "\xEF\xBB\xBF" + list;
  for (unsigned n = 1 + any(3); n > 0; --n) {
    std::string name = oneOf(kNames), listed = oneIn(12) ? oneOf(kNames) : name;
    list += name + value(listed);
    if (!oneIn(10)) sections += section(name, isDictionary);
  }
  if (oneIn(8)) sections += "[Other]\nx = 1\n";
  if (oneIn(12)) sections += "[Registration]\nfaked = \"1 2\"\n";
  if (oneIn(20)) sections += "[VLRContentsSection]\nghost = \"relative\"\n";
  return oneIn(6) ? sections + list : list + sections;
}

void RandomInstallation::addAny() {
  bool isDictionary = oneIn(2);
  std::string directory = isDictionary ? "Data Dictionaries" : "Experts";
  std::string suffix = isDictionary ? ".framework" : ".vle";
  if (oneIn(12)) suffix = oneOf({".VLE", ".bundle", "", ".Framework"});
  std::string bundle = oneOf(kBundles) + suffix, path = root() + "/" + directory + "/" + bundle;
  std::error_code ignored;
  if (fs::exists(path, ignored) && !fs::is_directory(path, ignored)) return;
  if (oneIn(20) && !fs::exists(path, ignored)) {
    fs::create_directories(root() + "/" + directory);
    WriteBytes(path, "a file");
    return;
  }
  if (fs::is_directory(path + "/Resources/Info.vlr", ignored)) return;
  std::string file = addBundle(directory, bundle, registration(isDictionary));
  touch(file, kInstalled + static_cast<time_t>(any(100000)));
  if (oneIn(25)) {
    unlink(file.c_str());
    if (oneIn(2)) fs::create_directory(file);
  }
}

std::vector<std::string> RandomInstallation::registrationFiles() const {
  std::vector<std::string> files;
  for (const char* directory : {"Data Dictionaries", "Experts"}) {
    std::error_code none;
    for (const auto& entry : fs::directory_iterator(root() + "/" + directory, none)) {
      std::string file = entry.path().string() + "/Resources/Info.vlr";
      if (fs::is_regular_file(file, none)) files.push_back(file);
    }
  }
  std::sort(files.begin(), files.end());  // one seed, one installation
  return files;
}

void RandomInstallation::removeAny() {
  std::vector<std::string> files = registrationFiles();
  if (files.empty()) return;
  fs::path file = files[any(static_cast<unsigned>(files.size()))];
  if (oneIn(3)) {
    fs::remove(file);
  } else {
    fs::remove_all(file.parent_path().parent_path());
  }
}

void RandomInstallation::touchAny() {
  std::vector<std::string> files = registrationFiles();
  if (files.empty()) return;
  const std::string& file = files[any(static_cast<unsigned>(files.size()))];
  if (oneIn(2)) WriteBytes(file, registration(oneIn(2)));
  touch(file, kInstalled + static_cast<time_t>(any(100000)));
}

void RandomInstallation::change() {
  for (unsigned n = any(3); n > 0; --n) addAny();
  for (unsigned n = any(3); n > 0; --n) removeAny();
  for (unsigned n = any(3); n > 0; --n) touchAny();
}

void RandomInstallation::damage() {
  auto append = [&](const std::string& text) {
    if (Exists(database())) WriteBytes(database(), ReadBytes(database()) + text);
  };
  switch (any(8)) {
    case 0:
      unlink(sidecar().c_str());
      break;
    case 1:
      append("[Added]\nby = \"hand\"\n");
      break;
    case 2:
      if (Exists(database())) WriteBytes(database() + ".durable", ReadBytes(database()));
      WriteBytes(database(), "[KORComponents]\nTank = \"Tank\"\n");
      break;
    case 3:
      unlink(database().c_str());
      break;
    case 4:
    case 5:
      append("[KORComponents]\nHand = \"Hand\"\n" + section("Hand", false) +
             "[KORComponents]\nBare = \"Bare\"\n[Bare]\nPnP = \"x\"\nFileName = \"" +
             oneOf({"", "one.vle", "two.vle"}) + "\"\n");
      break;
    case 6:
      fs::create_directories(root() + "/Data Dictionaries/Last");
      WriteBytes(root() + "/Data Dictionaries/Last/vlt.vlr",
                 "[KORComponents]\nL = L\n[L]\nFileName = \"/One.vle\"\nBINDING_CLASSES" +
                     value(bindingClasses()));
      break;
    default:
      break;
  }
}

}  // namespace vlt::test
