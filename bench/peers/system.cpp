// Rows 11, 14, 15 and 19: locks, the log, directories, loading.
#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <fnmatch.h>
#include <spdlog/sinks/basic_file_sink.h>
#include <spdlog/spdlog.h>
#include <string.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>
#include <vector>

#include "bench/peers/Contest.h"
#include "bench/peers/Parts.h"
#include "source/Common/ZtUtils/General/vlTracer.h"
#include "source/vlrHelpers.h"
#include "zt/fnd/osdep/Mutex.h"

namespace peers {
namespace {

int OpenLock(const char* name) {
  int fd = open((Place() + "/" + name).c_str(), O_RDWR | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
  Require(fd >= 0, name);
  return fd;
}

void RunLock() {
  zt::fnd::osdep::Mutex mutex{zt::fnd::String(L"peers")};
  int bare = OpenLock("bare.lock");
  const std::string path = Place() + "/bare.lock";
  Run({"11",
       "named lock, taken and given back",
       [&] {
         mutex.lock();
         mutex.unlock();
       },
       {{"flock", 1.3,
         [=] { Require(flock(bare, LOCK_EX) == 0 && flock(bare, LOCK_UN) == 0, "flock"); }},
        {"lstat of its path", 0, [=] {
           struct stat info;
           Require(lstat(path.c_str(), &info) == 0, "lstat");
         }}}});
  close(bare);
}

void RunLog() {
  std::string logs = Place() + "/logs";
  std::filesystem::create_directories(logs);
  vlTracer::Initialize(vlTracer::kSeverityErrors, vlTracer::kTargetFile,
                       std::wstring(logs.begin(), logs.end()).c_str(), 0);
  auto theirs = spdlog::basic_logger_mt("peers", Place() + "/theirs.log");
  theirs->flush_on(spdlog::level::info);
  int bare = OpenLock("bare.log");
  const char line[] = "  a line of the usual length, say\n";
  Run({"14",
       "a line of the log, flushed",
       [] { vlt_vlTracer::TraceOutput(' ', "a line of the usual length, say", false); },
       {{"lock and write", 1.2,
         [=] {
           Require(flock(bare, LOCK_EX) == 0 && write(bare, line, sizeof line - 1) > 0 &&
                       flock(bare, LOCK_UN) == 0,
                   "a bare line");
         }},
        {"spdlog", 0, [=] { theirs->info("a line of the usual length, say"); }}}});
  vlTracer::Cleanup();
  close(bare);
}

void RunScan() {
  std::string experts = Place() + "/scan";
  std::vector<std::string> paths;
  for (int i = 0; i < 1000; ++i) {
    paths.push_back(experts + "/Expert" + std::to_string(i) + ".vle");
    std::filesystem::create_directories(paths.back());
  }
  zt::fnd::String directory(experts.c_str());
  Run({"15",
       "1,000 names of a directory, and their times",
       [=] {
         zt::fnd::Vector<zt::fnd::String> names;
         Require(vlrGetComponentNamesFromDirectory(directory, L"vle", names) == S_OK, "names");
         for (const zt::fnd::String& name : names) vlrGetFileModificationTime(name);
       },
       {{"opendir, fnmatch, stat", 1.0,
         [=] {
           DIR* dir = opendir(experts.c_str());
           while (dirent* entry = readdir(dir)) {
             struct stat info;
             if (fnmatch("*.vle", entry->d_name, 0) != 0) continue;
             stat((experts + "/" + entry->d_name).c_str(), &info);
           }
           closedir(dir);
         }},
        // All that the second half of the job has to ask, as it takes a path.
        {"stat of ready paths", 0,
         [paths] {
           struct stat info;
           for (const std::string& path : paths) Require(stat(path.c_str(), &info) == 0, "stat");
         }},
        {"opendir, fstatat", 1.2, [=] {
           DIR* dir = opendir(experts.c_str());
           while (dirent* entry = readdir(dir)) {
             struct stat info;
             fstatat(dirfd(dir), entry->d_name, &info, 0);
           }
           closedir(dir);
         }}}});
}

// In a child, where the library has not been loaded before; the program itself holds its code too, but
// none of its names are visible.
void LoadInChild(const char* library) {
  pid_t pid = fork();
  if (pid == 0) _exit(library == nullptr || dlopen(library, RTLD_NOW) ? 0 : 1);
  int status = 1;
  waitpid(pid, &status, 0);
  Require(status == 0, "dlopen");
}

void RunLoad() {
  std::string self = std::filesystem::read_symlink("/proc/self/exe");
  std::string library =
      std::filesystem::path(self).parent_path().parent_path() / "lib/libvltutils.so";
  if (!std::filesystem::exists(library)) {
    fprintf(stderr, "row 19 is left out: no %s\n", library.c_str());
    return;
  }
  Run({"19",
       "a child that loads the library",
       [=] { LoadInChild(library.c_str()); },
       {{"a child that does not", 0, [] { LoadInChild(nullptr); }}}});
}

}  // namespace

void RunSystem() {
  RunLock();
  RunLog();
  RunScan();
  RunLoad();
}

}  // namespace peers
