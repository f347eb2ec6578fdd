#include "tests/support/Installation.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <sys/stat.h>

#include <cstdint>
#include <filesystem>

#include "tests/support/Child.h"

namespace vlt::test {

Installation::Installation() : m_root(m_dir.makeDir("KOR")) { setDir(m_root); }

void Installation::setDir(const std::string& directory) {
  std::string config = getenv("XDG_CONFIG_HOME");
  std::filesystem::create_directories(config);
  WriteBytes(config + "/com.zentrex.kor.ini", "[Preferences]\nDir = \"" + directory + "\"\n");
}

std::string Installation::addBundle(const std::string& directory, const std::string& bundle,
                                    const std::string& registration) {
  std::string resources = m_dir.makeDir("KOR/" + directory + "/" + bundle + "/Resources");
  std::string file = resources + "/Info.vlr";
  WriteBytes(file, registration);
  touch(file, kInstalled);
  return file;
}

void Installation::removeBundle(const std::string& directory, const std::string& bundle) {
  std::filesystem::remove_all(m_root + "/" + directory + "/" + bundle);
}

namespace {

std::string Registration(const std::string& component, const std::string& items) {
  return "[KORComponents]\n" + component + " = \"" + component + "\"\n[" + component + "]\n" +
         items;
}

std::string Item(const std::string& name, const std::string& value) {
  return value.empty() ? "" : name + " = \"" + value + "\"\n";
}

}  // namespace

std::string Installation::addDictionary(const std::string& bundle, const std::string& component,
                                        const std::string& guid, int schemaVersion,
                                        const std::string& prefix) {
  return addBundle("Data Dictionaries", bundle + ".framework",
                   Registration(component, Item("Identifier", guid) + Item("FileName", bundle) +
                                               "SchemaVersion = " + std::to_string(schemaVersion) +
                                               "\n" + Item("Prefix", prefix)));
}

std::string Installation::addObjectExpert(const std::string& bundle, const std::string& component,
                                          const std::string& guid,
                                          const std::string& bindingClasses) {
  return addBundle("Experts", bundle + ".vle",
                   Registration(component, Item("Identifier", guid) + Item("FileName", bundle) +
                                               Item("BINDING_CLASSES", bindingClasses)));
}

std::string Installation::addResourceExpert(const std::string& bundle, const std::string& component,
                                            const std::string& guid, const std::string& pnp,
                                            const std::string& bindingClasses) {
  return addBundle(
      "Experts", bundle + ".vle",
      Registration(component, Item("Identifier", guid) + Item("FileName", bundle) +
                                  Item("PnP", pnp) + Item("BINDING_CLASSES", bindingClasses)));
}

void Installation::touch(const std::string& file, time_t time) {
  timespec times[2] = {{time, 123456789}, {time, 123456789}};
  ASSERT_EQ(utimensat(AT_FDCWD, file.c_str(), times, 0), 0) << file;
}

std::string Installation::stamp(time_t time) {
  // 100-nanosecond ticks since 1601-01-01, in halves, the low one first.
  uint64_t ticks = (static_cast<uint64_t>(time) + 11644473600u) * 10000000u;
  return std::to_string(ticks & 0xFFFFFFFFu) + " " + std::to_string(ticks >> 32);
}

std::string Md5Sum(const std::string& file) {
  return RunProgram({"md5sum", "--", file}).out.substr(0, 32);
}

std::string Hex(const std::string& bytes) {
  std::string out;
  for (unsigned char byte : bytes) {
    out += "0123456789abcdef"[byte >> 4];
    out += "0123456789abcdef"[byte & 15];
  }
  return out;
}

}  // namespace vlt::test
