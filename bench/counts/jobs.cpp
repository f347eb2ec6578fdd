// One fixed job, for the counting of its instructions: see bench/counts/run.
#include <locale.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <filesystem>
#include <fstream>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "bench/Installation.h"
#include "source/Cmd5vlt.h"
#include "zt/fnd/Utf8ToWide.h"
#include "ztini/ztini.h"

namespace {

namespace fs = std::filesystem;

constexpr int kSections = 1000;
constexpr unsigned kBundles = 50;

[[noreturn]] void Fail(const char* what) {
  fprintf(stderr, "counts: %s failed\n", what);
  exit(1);
}

void Require(bool good, const char* what) {
  if (!good) Fail(what);
}

struct Dispose {
  void operator()(IniStructForwardReferenceTag* doc) const { IniDispose(doc); }
};
using Document = std::unique_ptr<IniStructForwardReferenceTag, Dispose>;

void WriteSections(const std::string& path) {
  std::ofstream out(path);
  for (int s = 0; s < kSections; ++s) {
    out << "[Component " << s << "]\n";
    for (int i = 0; i < 10; ++i) out << "Attribute" << i << " = \"value " << s * 10 + i << "\"\n";
  }
}

// With the options that the guarded files use.
Document Read(const std::string& path) {
  Document doc(IniNew(0));
  IniSetReadOptions(doc.get(), 22);
  IniSetWriteOptions(doc.get(), -1, 32, 26);
  Require(IniReadFromFile(doc.get(), path.c_str()) == 0, "reading");
  return doc;
}

void Install(const std::string& root) { bench::Install(root, kBundles); }

void Start(const std::string& root) { bench::Start(root); }

// A job that is ready to be counted.
using Job = std::function<void()>;

Job Parse(const std::string& place) {
  WriteSections(place + "/a.ini");
  return [=] { Read(place + "/a.ini"); };
}

Job ChangeAndSave(const std::string& place) {
  WriteSections(place + "/a.ini");
  auto doc = std::make_shared<Document>(Read(place + "/a.ini"));
  // The second one leaves the text that the next is made from.
  for (int saves = 0; saves < 2; ++saves) {
    Require(IniWriteToFile(doc->get(), (place + "/a.ini").c_str()) == 0, "the first saves");
  }
  return [=] {
    IniPut(doc->get(), "Component 500", "Attribute5", "another value", '"');
    Require(IniWriteToFile(doc->get(), (place + "/a.ini").c_str()) == 0, "a save");
  };
}

Job LookUp(const std::string& place) {
  WriteSections(place + "/a.ini");
  auto doc = std::make_shared<Document>(Read(place + "/a.ini"));
  return [=] {
    for (int n = 0; n < 4096; ++n) {
      const char* value = nullptr;
      std::string section = "component " + std::to_string(n * 7919 % kSections);
      std::string item = "Attribute" + std::to_string(n % 10);
      Require(IniGet(doc->get(), section.c_str(), item.c_str(), &value) == 1, "a look-up");
    }
  };
}

Job Text(const std::string&) {
  auto bytes = std::make_shared<std::string>();
  while (bytes->size() < 65536)
    *bytes += "/Library/Frameworks/Example.vle/ path \xC3\xA9\xE2\x82\xAC";
  auto out = std::make_shared<std::vector<wchar_t>>(bytes->size());
  return [=] {
    auto* begin = reinterpret_cast<const unsigned char*>(bytes->data());
    zt::fnd::Utf8ToWide(begin, begin + bytes->size(), out->data(), out->data() + out->size());
  };
}

Job FirstStart(const std::string& place) {
  Install(place + "/KOR");
  return [=] { Start(place + "/KOR"); };
}

Job SecondStart(const std::string& place) {
  Install(place + "/KOR");
  Start(place + "/KOR");
  return [=] { Start(place + "/KOR"); };
}

const std::map<std::string, Job (*)(const std::string& place)> kJobs = {
    {"parse", Parse}, {"save", ChangeAndSave},     {"look-up", LookUp},
    {"text", Text},   {"first-start", FirstStart}, {"second-start", SecondStart}};

}  // namespace

// By its name, the counter knows when to count.
extern "C" __attribute__((noinline)) void vlt_counted_job(const Job& job) { job(); }

int main(int argc, char** argv) {
  if (argc == 1) {
    for (const auto& [name, make] : kJobs) puts(name.c_str());
    return 0;
  }
  setlocale(LC_ALL, "C.UTF-8");
  auto found = kJobs.find(argv[1]);
  if (argc != 3 || found == kJobs.end()) {
    fprintf(stderr, "usage: counts JOB DIRECTORY\n");
    return 2;
  }
  std::string place = argv[2];
  setenv("HOME", place.c_str(), 1);
  setenv("XDG_CONFIG_HOME", (place + "/config").c_str(), 1);
  setenv("ZTFNDTMPSHAREDFILEDIR", (place + "/shared").c_str(), 1);
  fs::create_directories(place + "/config");
  std::ofstream(place + "/config/com.zentrex.kor.ini")
      << "[Preferences]\nDir = " << place << "/KOR\n";
  vlt_counted_job(found->second(place));
}
