#include "tools/vltctl/Claims.h"

#include <errno.h>
#include <fnmatch.h>
#include <string.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <set>

#include "source/Database/databaseText.h"
#include "source/Database/recordText.h"
#include "source/Snapshot/DatabaseFile.h"
#include "vlloader/source/InstallLayout.h"

namespace admin {
namespace {

namespace fs = std::filesystem;
using vlt::snapshot::GuidText;

struct Kind {
  std::string directory, suffix;
};

std::vector<Kind> Kinds() {
  using registrar::Narrow;
  return {{Narrow(vlt::layout::kDictionaries), ".framework"},
          {Narrow(vlt::layout::kExperts), ".vle"}};
}

bool HasSuffix(const std::string& path, const std::string& suffix) {
  return fnmatch(("*" + suffix).c_str(), path.c_str(), FNM_CASEFOLD) == 0;
}

Bundle::Where WhereIs(const std::string& root, const std::string& path) {
  bool isOfAnyKind = false;
  for (const Kind& kind : Kinds()) {
    bool hasSuffix = HasSuffix(path, kind.suffix);
    bool isInside = fs::path(path).parent_path() == fs::path(root + kind.directory);
    if (hasSuffix && isInside) return Bundle::Where::Right;
    if (hasSuffix) isOfAnyKind = true;
    if (isInside && !hasSuffix && fs::path(path).parent_path() == fs::path(root + kind.directory)) {
      for (const Kind& other : Kinds()) {
        if (HasSuffix(path, other.suffix)) return Bundle::Where::WrongPlace;
      }
      return Bundle::Where::WrongSuffix;
    }
  }
  return isOfAnyKind ? Bundle::Where::WrongPlace : Bundle::Where::WrongSuffix;
}

std::string EncodingOf(const std::string& bytes) {
  auto begins = [&](const char* mark, size_t size) {
    return bytes.compare(0, size, std::string(mark, size)) == 0;
  };
  if (begins("\xFF\xFE\0\0", 4) || begins("\0\0\xFE\xFF", 4)) return "UTF-32";
  return begins("\xFF\xFE", 2) || begins("\xFE\xFF", 2) ? "UTF-16" : "";
}

// The first directory or file on the way that may not be entered or read.
std::string ClosedPart(const std::string& file) {
  for (fs::path part : {fs::path(file).parent_path().parent_path(), fs::path(file).parent_path()}) {
    if (access(part.c_str(), X_OK) != 0) return part;
  }
  return file;
}

// A registration file that a start has set aside.
void FindSetAside(Bundle* bundle) {
  std::error_code none;
  for (const auto& entry : fs::directory_iterator(bundle->path + "/Resources", none)) {
    std::string name = entry.path().filename();
    if (!name.starts_with("Info.vlr_") || !name.ends_with(".bad")) continue;
    std::string bytes;
    vlt::snapshot::DatabaseAccess().read(entry.path(), &bytes);
    bundle->state = Bundle::File::SetAside;
    bundle->badFile = entry.path();
    bundle->encoding = EncodingOf(bytes);
  }
}

void ReadFile(Bundle* bundle) {
  std::string bytes;
  int error = vlt::snapshot::DatabaseAccess().read(bundle->file, &bytes);
  if (error == EACCES || error == EPERM) {
    bundle->state = Bundle::File::Closed;
    bundle->closed = ClosedPart(bundle->file);
    return;
  }
  if (error != 0) return FindSetAside(bundle);
  auto document = std::make_shared<IniDocument>(true);
  if (document->Parse(bytes) != 0) {
    bundle->state = Bundle::File::NotUtf8;
    bundle->encoding = EncodingOf(bytes);
    return;
  }
  bundle->state = Bundle::File::Readable;
  bundle->document = document;
}

}  // namespace

std::string Bundle::stem() const { return fs::path(path).stem(); }

Bundle BundleAt(const std::string& root, const std::string& path) {
  const std::string inner = "/Resources/Info.vlr";
  Bundle bundle;
  bundle.path = path.ends_with(inner) ? path.substr(0, path.size() - inner.size()) : path;
  while (bundle.path.size() > 1 && bundle.path.back() == '/') bundle.path.pop_back();
  bundle.file = bundle.path + inner;
  bundle.where = WhereIs(root, bundle.path);
  ReadFile(&bundle);
  return bundle;
}

std::vector<Bundle> FindBundles(const std::string& root) {
  std::vector<Bundle> bundles;
  std::error_code none;
  for (const Kind& kind : Kinds()) {
    for (const auto& entry : fs::directory_iterator(root + kind.directory, none)) {
      bundles.push_back(BundleAt(root, entry.path()));
    }
  }
  for (const auto& entry : fs::directory_iterator(root, none)) {
    for (const Kind& kind : Kinds()) {
      if (HasSuffix(entry.path(), kind.suffix)) bundles.push_back(BundleAt(root, entry.path()));
    }
  }
  return bundles;
}

std::vector<Claim> ClaimsOf(const Bundle& bundle) {
  std::vector<Claim> claims;
  if (!bundle.document) return claims;
  const IniDocument& document = *bundle.document;
  std::set<std::string> listed;
  auto add = [&](const std::string& key, const std::string& value, bool isListed) {
    Claim claim;
    claim.bundle = &bundle;
    claim.key = key;
    claim.value = value;
    claim.isListed = isListed;
    claim.hasSection = document.SectionExists(key.c_str()) >= 0;
    claim.guid =
        GuidText(registrar::ReadRecord(document, key, registrar::EmptyFileName::IsNone).identifier);
    claims.push_back(claim);
  };
  for (int n = 1; n <= document.GetNumberOfItems(registrar::kComponents); ++n) {
    std::string key, value;
    if (document.GetNthItemName(registrar::kComponents, n, &key) < 0) continue;
    document.GetItem(registrar::kComponents, key.c_str(), &value);
    listed.insert(key);
    add(key, value, true);
  }
  for (int n = 1; n <= document.GetNumberOfSections(); ++n) {
    std::string section;
    if (document.GetNthSectionName(n, &section) < 0) continue;
    bool isKnown = listed.count(section) || registrar::IsReserved(section);
    if (!isKnown) add(section, section, false);
  }
  return claims;
}

}  // namespace admin
