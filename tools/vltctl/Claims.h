#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "source/IniDocument.h"
#include "source/Snapshot/Rehearsal.h"

// What the bundles of an installation claim to bring, whether a scan looks there or not.
namespace admin {

// A bundle, with its registration file.
struct Bundle {
  enum class Where { Right, WrongPlace, WrongSuffix };
  enum class File { Readable, Missing, Closed, NotUtf8, SetAside };

  std::string path, file;  // of the bundle and its registration file
  Where where = Where::Right;
  File state = File::Missing;
  std::string closed;                     // Closed: what may not be entered or read
  std::string badFile, encoding;          // SetAside and NotUtf8
  std::shared_ptr<IniDocument> document;  // Readable

  // "Tank" of "/r/Experts/Tank.vle".
  std::string stem() const;
};

// All entries of the two directories of bundles, and bundles that lie elsewhere below the root; in
// a scan's order.
std::vector<Bundle> FindBundles(const std::string& root);
// The one at a path, which need not be below the root.
Bundle BundleAt(const std::string& root, const std::string& path);

// A component that a registration file speaks of: listed, or with a section, or both.
struct Claim {
  const Bundle* bundle = nullptr;
  std::string key, value;  // of the list; both the section's name for one that is not listed
  bool isListed = false, hasSection = false;
  std::string guid;  // "{...}"
};
std::vector<Claim> ClaimsOf(const Bundle& bundle);

}  // namespace admin
