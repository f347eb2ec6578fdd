// new: the skeleton of a component, which builds, registers and checks sound as it is.
#include <errno.h>
#include <fcntl.h>
#include <string.h>

#include <algorithm>
#include <filesystem>

#include "tools/vltctl/Reading.h"
#include "zt/fnd/Guid.h"
#include "zt/fnd/String.h"
#include "zt/fnd/osdep/MakeGUID.h"
#include "zt/posix/Files.h"

namespace admin {
namespace {

namespace fs = std::filesystem;
using vltctl::Failure;
using zt::posix::ScopedFd;

struct Kind {
  const char *word, *extension, *directory, *items, *source;
};

constexpr const char* kDictionarySource =
    R"(// The dictionary @NAME@. Programs load it; nothing is asked of it by name.
extern "C" int vltGetDataDictionary() { return 0; }
)";
constexpr const char* kObjectSource =
    R"(// The object expert @NAME@. The storage finds this entry point by its name.
extern "C" int vltCreateObjectExpert() { return 0; }
)";
constexpr const char* kResourceSource =
    R"(// The resource expert @NAME@. The storage finds this entry point by its name.
extern "C" int vltCreateResourceExpert() { return 0; }
)";

constexpr Kind kKinds[] = {
    {"dictionary", "framework", "Data Dictionaries", "SchemaVersion = 1\nPrefix = \"@PREFIX@\"\n",
     kDictionarySource},
    {"object-expert", "vle", "Experts", "BINDING_CLASSES = \"{@GUID@}:1:{@CLASS@}\"\n",
     kObjectSource},
    {"resource-expert", "vle", "Experts",
     "BINDING_CLASSES = \"{@GUID@}:1:{@CLASS@}\"\nPnP = \"PNP0000\"\n", kResourceSource}};

constexpr const char* kRegistration = R"([KORComponents]
@NAME@ = "@NAME@"

[@NAME@]
Identifier = "{@GUID@}"
FileName = "@NAME@"
)";

constexpr const char* kBuild =
    R"(# Builds the bundle @NAME@.@EXTENSION@; "cmake --install" puts it into an installation:
#   cmake -S . -B build && cmake --build build && cmake --install build --prefix INSTALL-DIRECTORY
cmake_minimum_required(VERSION 3.16)
project(@NAME@ LANGUAGES CXX)
set(bundle ${CMAKE_BINARY_DIR}/@NAME@.@EXTENSION@)
add_library(@NAME@ MODULE @NAME@.cpp)
set_target_properties(@NAME@ PROPERTIES PREFIX lib SUFFIX .so LIBRARY_OUTPUT_DIRECTORY ${bundle})
configure_file(Info.vlr ${bundle}/Resources/Info.vlr COPYONLY)
install(DIRECTORY ${bundle} DESTINATION "@DIRECTORY@" USE_SOURCE_PERMISSIONS)
)";

const Kind& KindOf(const std::string& word) {
  for (const Kind& kind : kKinds) {
    if (word == kind.word) return kind;
  }
  std::string guess = vltctl::DidYouMean(word, {"dictionary", "object-expert", "resource-expert"});
  throw Failure(vltctl::kUsage,
                {"no-such-kind", "", "no such kind of component: " + word, "",
                 guess.empty() ? "give dictionary, object-expert or resource-expert" : guess});
}

// A name that is a file, a target of the build and a section alike.
void ExpectName(const std::string& name) {
  bool isPlain = !name.empty() && isalpha(static_cast<unsigned char>(name[0])) &&
                 std::all_of(name.begin(), name.end(), [](unsigned char c) {
                   return c < 0x80 && (isalnum(c) || c == '_' || c == '-');
                 });
  if (isPlain) return;
  throw Failure(vltctl::kUsage, {"bad-name", "--name", "\"" + name + "\" is no name for a bundle",
                                 "", "give letters, digits, \"-\" and \"_\", a letter first"});
}

std::string FreshGuid() {
  zt::fnd::String text;
  zt::fnd::Guid(zt::fnd::osdep::MakeGUID()).toString(text);
  std::string guid = zt::fnd::AnsiString(text).c_str();
  guid.erase(std::remove_if(guid.begin(), guid.end(), [](char c) { return c == '{' || c == '}'; }),
             guid.end());
  return guid;
}

std::string Replaced(std::string text,
                     const std::vector<std::pair<std::string, std::string>>& words) {
  for (const auto& [word, by] : words) {
    for (size_t at = 0; (at = text.find(word, at)) != std::string::npos; at += by.size()) {
      text.replace(at, word.size(), by);
    }
  }
  return text;
}

Failure CannotWrite(const std::string& file, int error) {
  return {vltctl::kCannotWrite,
          {"cannot-write", file, "cannot be made", strerror(error),
           "check the rights to its directory and the space on the disk"}};
}

void Write(const std::string& file, const std::string& text, Output& output) {
  ScopedFd fd = zt::posix::CreateNew(file.c_str(), O_WRONLY, 0666);
  if (!fd || !zt::posix::WriteAll(fd.get(), text.data(), text.size()))
    throw CannotWrite(file, errno);
  output.item({{"file", file}});
  output.line(file);
}

void ExpectEmpty(const fs::path& directory) {
  std::error_code failed;
  if (!fs::exists(directory, failed) || fs::is_empty(directory, failed)) return;
  throw Failure(vltctl::kCannotWrite, {"not-empty", directory, "there is something already", "",
                                       "give a directory that is empty or missing"});
}

}  // namespace

int New(const Arguments& arguments, Output& output) {
  const std::string kindName = arguments.text("KIND");
  const Kind& kind = KindOf(kindName);
  const std::string name = arguments.text("--name"), guid = FreshGuid();
  if (!arguments.has("--name")) {
    throw Failure(vltctl::kUsage, {"usage", "", "new needs a name", "", "give it as --name NAME"});
  }
  ExpectName(name);
  std::string boundTo = arguments.has("--class") ? arguments.text("--class") : FreshGuid();
  if (!vltctl::IsGuidText(boundTo)) {
    throw Failure(vltctl::kUsage, {"bad-class", "--class", "\"" + boundTo + "\" is no GUID", "",
                                   "give the identifier of the class, with or without braces"});
  }
  if (boundTo.front() == '{') boundTo = boundTo.substr(1, 36);
  const fs::path directory = arguments.text("DIR");
  ExpectEmpty(directory);
  std::error_code failed;
  fs::create_directories(directory, failed);
  if (failed) throw CannotWrite(directory, failed.value());
  std::string prefix = name.substr(0, 2);
  std::transform(prefix.begin(), prefix.end(), prefix.begin(),
                 [](unsigned char c) { return tolower(c); });
  auto filled = [&](const std::string& text) {
    return Replaced(text, {{"@NAME@", name},
                           {"@GUID@", guid},
                           {"@CLASS@", boundTo},
                           {"@PREFIX@", prefix},
                           {"@EXTENSION@", kind.extension},
                           {"@DIRECTORY@", kind.directory}});
  };
  Write(directory / "CMakeLists.txt", filled(kBuild), output);
  Write(directory / (name + ".cpp"), filled(kind.source), output);
  Write(directory / "Info.vlr", filled(std::string(kRegistration) + kind.items), output);
  return vltctl::kGood;
}

}  // namespace admin
