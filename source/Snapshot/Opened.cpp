#include "source/Snapshot/Opened.h"

#include "source/Database/databaseText.h"
#include "source/Snapshot/DatabaseFile.h"
#include "source/Snapshot/Tree.h"
#include "vlloader/source/InstallLayout.h"

using registrar::Narrow;
using registrar::Widen;
using zt::fnd::String;

namespace vlt::snapshot {
namespace {

Opened Open(const std::string& here) {
  DatabaseAccess access;
  DatabaseBytes read = ReadDatabase(here + Narrow(layout::kDatabase), access);
  return {{here, here}, read.database, std::move(read.bytes)};
}

}  // namespace

Opened OpenInForce() {
  String root = layout::InstallRoot();
  if (root.empty()) throw std::runtime_error("the preference \"Dir\" names no directory");
  return Open(Narrow(root));
}

Opened OpenAt(const std::string& root) {
  if (root.empty()) throw std::runtime_error("no directory");
  Opened opened = Open(Narrow(layout::FileIn(Widen(root), L"")));
  opened.place.recorded = RecordedRoot(opened.bytes, opened.place.here);
  return opened;
}

// Whether a registrar begins with what the database holds.
bool IsTaken(DatabaseState state) {
  return state == DatabaseState::Sound || state == DatabaseState::DigestDiffers ||
         state == DatabaseState::SidecarMissing;
}

}  // namespace vlt::snapshot
