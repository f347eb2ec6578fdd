// jar and identity: what server and clients have left each other.
#include "source/Snapshot/snapshot.hpp"
#include "source/Utilities/vltjar.h"
#include "source/Utilities/vltutils.h"
#include "tools/vltctl/Reading.h"
#include "tools/vltctl/Root.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/Guid.h"
#include "zt/fnd/String.h"

namespace admin {

namespace {

std::string JarFile() { return DataFile(zt::fnd::AnsiString(vlt::layout::kJar).c_str()); }

GuardedBytes ReadJar() {
  GuardedBytes read = ReadGuarded(JarFile());
  if (read.state == GuardedBytes::State::Unreadable) throw Unusable(JarFile(), read.error);
  return read;
}

std::string TextOf(const GUID& identity) {
  wchar_t* wide = vltGuidToString(identity);
  std::string text = zt::fnd::AnsiString(wide).c_str();
  vltFree(wide);
  return text;
}

// Of the installation in force: made if there is none.
std::string OwnIdentity() {
  GUID identity = {};
  if (vltGetServerIdentity(&identity) >= 0) return TextOf(identity);
  throw vltctl::Failure(
      vltctl::kDataUnusable,
      {"no-identity", JarFile(), "there is no identity, and none can be made", "",
       "install the library \"ZT-RPC\", which makes identifiers, or start the server once"});
}

// Of --root: never made, since two machines would have it if the image were copied.
std::string ImagesIdentity() {
  auto value = Document(ReadJar().bytes).get(vltjar::kServerSection, vltjar::kServerIdentity);
  auto guid = value ? vlt::snapshot::ParseGuid(*value) : std::nullopt;
  if (guid) return *guid;
  throw vltctl::Failure(vltctl::kNotFound,
                        {"no-identity", JarFile(), "the image has no identity", "",
                         "the first start of a server on its machine makes it"});
}

}  // namespace

int Jar(const Arguments&, Output& output) {
  GuardedBytes read = ReadJar();
  if (read.state == GuardedBytes::State::Missing) {
    throw vltctl::Failure(vltctl::kNotFound, {"no-jar", JarFile(), "there is no jar", "",
                                              "a server makes it when it starts"});
  }
  Document document(read.bytes);
  vltctl::Table table;
  for (const std::string& section : document.sections()) {
    for (const auto& [item, value] : document.items(section)) {
      table.add({item, value, "[" + section + "]"});
      output.item({{"section", section}, {"name", item}, {"value", value}});
    }
  }
  output.print(table);
  return document.status() < 0 ? vltctl::kDataUnusable : vltctl::kGood;
}

int Identity(const Arguments&, Output& output) {
  const std::string text = HasChosenRoot() ? ImagesIdentity() : OwnIdentity();
  output.item({{"identity", text}});
  output.line(text);
  return vltctl::kGood;
}

}  // namespace admin
