// jar and identity: what server and clients have left each other.
#include "source/Utilities/vltutils.h"
#include "tools/vltctl/Reading.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/Guid.h"
#include "zt/fnd/String.h"

namespace admin {

int Jar(const Arguments&, Output& output) {
  std::string file = DataFile(zt::fnd::AnsiString(vlt::layout::kJar).c_str());
  GuardedBytes read = ReadGuarded(file);
  if (read.state == GuardedBytes::State::Unreadable) throw Unusable(file, read.error);
  if (read.state == GuardedBytes::State::Missing) {
    throw vltctl::Failure(vltctl::kNotFound, {"no-jar", file, "there is no jar", "",
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
  GUID identity = {};
  if (vltGetServerIdentity(&identity) < 0) {
    throw vltctl::Failure(
        vltctl::kDataUnusable,
        {"no-identity", DataFile(zt::fnd::AnsiString(vlt::layout::kJar).c_str()),
         "there is no identity, and none can be made", "",
         "install the library \"ZT-RPC\", which makes identifiers, or start the server once"});
  }
  wchar_t* wide = vltGuidToString(identity);
  std::string text = zt::fnd::AnsiString(wide).c_str();
  vltFree(wide);
  output.item({{"identity", text}});
  output.line(text);
  return vltctl::kGood;
}

}  // namespace admin
