// Rows 16 to 18: starts of the registrar and its answers.
#include <dirent.h>
#include <fcntl.h>
#include <glib.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <map>
#include <memory>
#include <set>
#include <vector>

#include "bench/Installation.h"
#include "bench/peers/Contest.h"
#include "bench/peers/Parts.h"
#include "source/Common/vltcmn.h"
#include "source/Database/registrationFiles.h"
#include "zt/fnd/Guid.h"
#include "ztcom/ztcore/ztcom.h"
#include "ztini/ztini.h"

namespace peers {
namespace {

namespace fs = std::filesystem;

std::string Root() { return Place() + "/KOR"; }

void Install(unsigned bundles) { bench::Install(Root(), bundles); }

CztComPtr<IvltRegistrar> Start() { return bench::Start(Root()); }

// ---- The composition: GKeyFile, flock and MD5 doing the same job in the plain way.

std::string Theirs() { return Place() + "/theirs.vlr"; }

struct KeyFileFree {
  void operator()(GKeyFile* file) const { g_key_file_free(file); }
};
using KeyFile = std::unique_ptr<GKeyFile, KeyFileFree>;

void SaveKeys(GKeyFile* database) {
  gsize size = 0;
  char* data = g_key_file_to_data(database, &size, nullptr);
  std::string text(data, size);
  g_free(data);
  Replace(Theirs(), text);
  WriteSidecar(Theirs() + ".md5", Md5(text));
}

KeyFile LoadKeys(const std::string& path) {
  KeyFile file(g_key_file_new());
  g_key_file_load_from_file(file.get(), path.c_str(), G_KEY_FILE_KEEP_COMMENTS, nullptr);
  return file;
}

// A registration file under its lock, copied into the database, which is saved.
void Merge(GKeyFile* database, const std::string& name, const std::string& file,
           const char* stamp) {
  int lock =
      open((Place() + "/shared/" + name + ".lock").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666);
  Require(lock >= 0 && flock(lock, LOCK_EX) == 0, "their lock");
  KeyFile brought = LoadKeys(file);
  char** groups = g_key_file_get_groups(brought.get(), nullptr);
  for (char** group = groups; *group; ++group) {
    char** keys = g_key_file_get_keys(brought.get(), *group, nullptr, nullptr);
    for (char** key = keys; *key; ++key) {
      char* value = g_key_file_get_value(brought.get(), *group, *key, nullptr);
      g_key_file_set_value(database, *group, *key, value);
      g_free(value);
    }
    g_strfreev(keys);
  }
  g_strfreev(groups);
  g_key_file_set_value(database, "Files", name.c_str(), stamp);
  SaveKeys(database);
  close(lock);
}

void StartComposition() {
  int lock = open((Place() + "/shared/database.lock").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0666);
  Require(lock >= 0 && flock(lock, LOCK_EX) == 0, "their lock");
  if (fs::exists(Theirs())) {
    Require(Md5(ReadFile(Theirs())) == ReadFile(Theirs() + ".md5"), "their digest");
  }
  KeyFile database = LoadKeys(Theirs());
  std::string experts = Root() + "/Experts";
  DIR* directory = opendir(experts.c_str());
  Require(directory != nullptr, "their scan");
  while (dirent* entry = readdir(directory)) {
    if (entry->d_name[0] == '.') continue;
    std::string file = experts + "/" + entry->d_name + "/Resources/Info.vlr";
    struct stat info;
    Require(stat(file.c_str(), &info) == 0, "their stat");
    std::string stamp = std::to_string(info.st_mtime);
    char* known = g_key_file_get_value(database.get(), "Files", entry->d_name, nullptr);
    if (!known || stamp != known) Merge(database.get(), entry->d_name, file, stamp.c_str());
    g_free(known);
  }
  closedir(directory);
  std::map<std::string, std::string> components;
  char** names = g_key_file_get_keys(database.get(), "KORComponents", nullptr, nullptr);
  for (char** name = names; name && *name; ++name) {
    char* id = g_key_file_get_value(database.get(), *name, "Identifier", nullptr);
    components[id ? id : ""] = *name;
    g_free(id);
  }
  g_strfreev(names);
  SaveKeys(database.get());
  close(lock);
}

// ---- The floor: only the saves, each with as many bytes as there are after that many files.

void BareSaves(unsigned bundles, const std::string& whole) {
  for (unsigned n = 1; n <= bundles; ++n) {
    std::string text = whole.substr(0, whole.size() * n / bundles);
    Replace(Place() + "/bare.vlr", text);
    WriteSidecar(Place() + "/bare.vl5", Md5(text));
  }
}

// ---- The three parts of a start that finds nothing new, without what holds them together: no lock,
// no check, no comparison, no components.

void ParseScanSave() {
  std::unique_ptr<IniStructForwardReferenceTag, void (*)(IniStructForwardReferenceTag*)> document(
      IniNew(0), IniDispose);
  IniSetReadOptions(document.get(), 22);
  const std::string database = Root() + "/vlt.vlr";
  Require(IniReadFromFile(document.get(), database.c_str()) == 0, "the parsing");
  registrar::RegistrationFiles files;
  registrar::AppendRegistrationFiles(zt::fnd::String((Root() + "/Experts").c_str()),
                                     zt::fnd::String(L"*.vle"), files);
  const std::string text = ReadFile(database);
  Replace(Place() + "/bare.vlr", text);
  WriteSidecar(Place() + "/bare.vl5", Md5(text));
}

void RemoveDatabases() {
  for (const char* name : {"/vlt.vlr", "/vlt.vl5", "/vlt.vlr.durable"}) fs::remove(Root() + name);
  fs::remove(Theirs());
  fs::remove(Theirs() + ".md5");
}

void RunStarts(unsigned bundles) {
  std::string count = std::to_string(bundles) + " bundles";
  Install(bundles);
  fs::create_directories(Place() + "/shared");
  Start();
  std::string whole = ReadFile(Root() + "/vlt.vlr");
  if (bundles <= 3000) {
    std::vector<Rival> rivals;
    if (bundles == 1000) rivals.push_back({"GKeyFile composed", 0.4, StartComposition});
    rivals.push_back({"bare saves", 1.2, [&] { BareSaves(bundles, whole); }});
    Run({bundles == 1000 ? "17" : "17b", "first start, " + count, Start, rivals, RemoveDatabases,
         bundles == 1000 ? 5 : 3});
  }
  RemoveDatabases();
  Start();
  StartComposition();
  Run({bundles == 1000 ? "16" : "16b",
       "second start, " + count,
       Start,
       {{"GKeyFile composed", 0.7, StartComposition},
        {"parse, scan, save", bundles == 1000 ? 1.5 : 0.0, ParseScanSave}},
       [] {},
       bundles == 1000 ? 15 : 5});
}

// ---- Processes that start at once take turns at the database.

double Milliseconds() {
  timespec now;
  clock_gettime(CLOCK_MONOTONIC, &now);
  return static_cast<double>(now.tv_sec) * 1e3 + static_cast<double>(now.tv_nsec) / 1e6;
}

// Starts so many processes; the time from the first fork to the end of the last.
double StartTogether(int processes) {
  double begin = Milliseconds();
  for (int n = 0; n < processes; ++n) {
    pid_t child = fork();
    Require(child >= 0, "fork");
    if (child == 0) {
      Start();
      _exit(0);
    }
  }
  for (int n = 0; n < processes; ++n) {
    int status = -1;
    Require(wait(&status) > 0 && status == 0, "a start beside others");
  }
  return Milliseconds() - begin;
}

double Median(std::vector<double> values) {
  std::nth_element(values.begin(), values.begin() + static_cast<long>(values.size() / 2),
                   values.end());
  return values[values.size() / 2];
}

void RunTurns() {
  constexpr int kRounds = 15;
  puts("row  second starts at once, 1000 bundles: total, and what each costs beyond one alone");
  double alone = 0;
  for (int processes : {1, 2, 4, 8, 16}) {
    std::vector<double> totals;
    for (int round = 0; round < kRounds; ++round) totals.push_back(StartTogether(processes));
    double total = Median(totals);
    if (processes == 1) alone = total;
    printf("20   %2d processes %8.1f ms %8.2f ms\n", processes, total, total / processes - alone);
    fflush(stdout);
  }
}

void RunAnswers(unsigned components) {
  Install(components);
  CztComPtr<IvltRegistrar> registrar = Start();
  std::map<GUID, std::wstring> map;
  for (unsigned n = 0; n < components; ++n) map[bench::Id(n)] = L"Expert" + std::to_wstring(n);
  unsigned n = 0, m = 0;
  Run({"18",
       "GetComponent and free, of " + std::to_string(components),
       [&] {
         _vltComponent2 record;
         Require(registrar->GetComponent(bench::Id(n), &record) == S_OK, "GetComponent");
         vltFreeComponent2(record);
         n = (n + 7919) % components;
       },
       {{"std::map, two copies", 1.0, [&] {
           const std::wstring& name = map.find(bench::Id(m))->second;
           wchar_t* copies[] = {wcsdup(name.c_str()), wcsdup(name.c_str())};
           for (wchar_t* copy : copies) free(copy);
           m = (m + 7919) % components;
         }}}});
}

}  // namespace

void RunRegistrar() {
  RunStarts(1000);
  RunTurns();
  RunAnswers(1000);
  RunStarts(3000);
  RunStarts(10000);
  RunAnswers(10000);
}

}  // namespace peers
