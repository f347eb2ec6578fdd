// why: one verdict on a component, and what to do about it.
#include <stdio.h>
#include <string.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <fstream>
#include <optional>
#include <sstream>

#include "source/Database/databaseText.h"
#include "source/Snapshot/Opened.h"
#include "tools/common/Locale.h"
#include "tools/common/LockHolder.h"
#include "tools/vltctl/Claims.h"
#include "tools/vltctl/Components.h"
#include "tools/vltctl/Content.h"
#include "tools/vltctl/GuardedFiles.h"
#include "tools/vltctl/Library.h"
#include "tools/vltctl/Reading.h"
#include "tools/vltctl/Root.h"
#include "vlloader/source/InstallLayout.h"

namespace admin {
namespace {

using vlt::snapshot::FileState;
using vlt::snapshot::Opened;
using vltctl::Json;

constexpr const char* kNullGuid = "{00000000-0000-0000-0000-000000000000}";

struct Verdict {
  std::string code, component, where, what, next;
};

double SecondsOf(const timespec& time) {
  return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) / 1e9;
}

double SecondsOn(clockid_t clock) {
  timespec now;
  clock_gettime(clock, &now);
  return SecondsOf(now);
}

// When the process started, in seconds since the epoch; nothing if that cannot be said.
std::optional<double> StartOf(pid_t pid) {
  constexpr int kFieldsBeforeStart = 19;  // after the name, which may hold blanks and brackets
  std::ifstream file("/proc/" + std::to_string(pid) + "/stat");
  std::string line, field;
  std::getline(file, line);
  std::istringstream fields(line.substr(line.rfind(')') + 1));
  for (int n = 0; n < kFieldsBeforeStart; ++n) fields >> field;
  double ticks;
  if (!(fields >> ticks)) return std::nullopt;
  double sinceBoot = ticks / static_cast<double>(sysconf(_SC_CLK_TCK));
  return SecondsOn(CLOCK_REALTIME) - SecondsOn(CLOCK_BOOTTIME) + sinceBoot;
}

double ChangeOf(const std::string& file) {
  struct stat info;
  return stat(file.c_str(), &info) == 0 ? SecondsOf(info.st_ctim) : 0;
}

std::string ModeText(const std::string& path) {
  struct stat info;
  char text[16] = "?";
  if (stat(path.c_str(), &info) == 0) snprintf(text, sizeof text, "%04o", info.st_mode & 07777);
  return text;
}

bool IsThere(const std::string& path) { return access(path.c_str(), F_OK) == 0; }

class Judge {
 public:
  Judge(const Opened& opened, const Snapshot& snapshot, const std::string& text)
      : m_opened(opened), m_snapshot(snapshot), m_text(text), m_document(true) {
    m_document.Parse(opened.bytes);
    m_bundles = FindBundles(opened.place.here);
    if (text.find('/') != std::string::npos) m_path = BundleAt(opened.place.here, text);
  }

  Verdict verdict() {
    if (m_path) {
      if (Verdict v = ofBundle(*m_path); !v.code.empty()) return v;
      std::vector<Claim> claims = ClaimsOf(*m_path);
      return claims.empty() ? ofNothing() : ofClaim(claims[0]);
    }
    if (const Claim* claim = bestClaim()) {
      if (Verdict v = ofBundle(*claim->bundle); !v.code.empty()) return v;
      return ofClaim(*claim);
    }
    std::vector<const Component*> found = Matches(m_snapshot, m_text);
    if (found.size() == 1) return ofComponent(*found[0]);
    for (const Bundle& bundle : m_bundles) {
      if (bundle.stem() != m_text) continue;
      if (Verdict v = ofBundle(bundle); !v.code.empty()) return v;
    }
    return ofNothing();
  }

 private:
  bool means(const Claim& claim) const {
    return claim.key == m_text || claim.value == m_text ||
           (claim.guid != kNullGuid && vlt::snapshot::ParseGuid(m_text) == claim.guid);
  }

  // Of several the one that a scan finds, and of those the last, which counts.
  const Claim* bestClaim() {
    const Claim* best = nullptr;
    for (const Bundle& bundle : m_bundles) {
      for (const Claim& claim : ClaimsOf(bundle)) {
        if (means(claim)) m_claims.push_back(claim);
      }
    }
    auto rank = [](const Claim& c) {
      return (c.bundle->where == Bundle::Where::Right) * 2 + c.isListed;
    };
    for (const Claim& claim : m_claims) {
      if (!best || rank(claim) >= rank(*best)) best = &claim;
    }
    return best;
  }

  // Why a scan finds nothing in the bundle; no code if it does.
  Verdict ofBundle(const Bundle& bundle) const {
    switch (bundle.state) {
      case Bundle::File::Missing:
        return {"no-file", "", bundle.file, "there is no registration file",
                "install the bundle again"};
      case Bundle::File::Closed:
        return {"closed", "", bundle.closed,
                "may not be entered or read: its mode is " + ModeText(bundle.closed),
                "give all users the right to read it"};
      case Bundle::File::NotUtf8:
        return {"set-aside", "", bundle.file,
                "is in " + bundle.encoding + "; the next start sets it aside", "save it in UTF-8"};
      case Bundle::File::SetAside:
        return {"set-aside", "", bundle.badFile,
                "is what a start has set aside" +
                    (bundle.encoding.empty() ? "" : ", as it is in " + bundle.encoding),
                "save it in UTF-8 as " + bundle.file};
      case Bundle::File::Readable:
        break;
    }
    switch (bundle.where) {
      case Bundle::Where::WrongPlace:
        return {"wrong-place", "", bundle.path, "is not where a scan looks for bundles of its kind",
                "move a .framework to \"Data Dictionaries\", and a .vle to \"Experts\""};
      case Bundle::Where::WrongSuffix:
        return {"wrong-suffix", "", bundle.path, "has a suffix that no scan looks for",
                "dictionaries are named NAME.framework, experts NAME.vle"};
      case Bundle::Where::Right:
        break;
    }
    return {};
  }

  Verdict ofClaim(const Claim& claim) {
    const std::string& file = claim.bundle->file;
    if (!claim.isListed) {
      return {"not-listed", claim.key, file, "[KORComponents] does not list it",
              "add the line " + claim.key + " = \"" + claim.key + "\""};
    }
    if (claim.key != claim.value) {
      return {"key-and-value-differ", claim.key, file,
              "[KORComponents] lists it as " + claim.key + " = \"" + claim.value + "\"",
              "make both the name of its section"};
    }
    if (!claim.hasSection) {
      return {"no-section", claim.key, file, "has no section of that name",
              "add [" + claim.key + "] with its Identifier and FileName"};
    }
    if (claim.guid == kNullGuid) {
      return {"guid-null", claim.key, file, "its Identifier is missing, null or no GUID",
              "give it an Identifier of its own"};
    }
    if (Verdict v = ofFile(claim); !v.code.empty()) return v;
    const Component* component = m_snapshot.find(claim.guid);
    if (component && component->name != vlt::snapshot::Utf8(claim.key)) {
      return {"guid-taken-by", claim.key, component->registrationFile,
              component->name + " has the same Identifier " + claim.guid,
              "give one of them another Identifier"};
    }
    return component ? ofComponent(*component) : ofNothing();
  }

  FileState stateOf(const std::string& file) const {
    for (const auto& known : m_snapshot.files) {
      if (known.path == vlt::snapshot::Utf8(file)) return known.state;
    }
    return FileState::New;
  }

  // What the database has of the claim's file; no code if that is what it says.
  Verdict ofFile(const Claim& claim) {
    const std::string& file = claim.bundle->file;
    FileState state = stateOf(file);
    if (state != FileState::Unchanged) return ofUnmerged(claim);
    std::string from;
    m_document.GetItem(registrar::kContents, claim.key.c_str(), &from);
    from = m_opened.place.toHere(from);
    if (from != file && IsThere(from)) {
      return {"overlaid-by", claim.key, from, "brings a component of that name, too, and counts",
              "give one of them another name"};
    }
    if (ItemsAfterMerge(m_opened, file, claim.key) != ItemsOf(m_document, claim.key)) {
      return {"stamp-equal-but-changed", claim.key, file,
              "was changed and has the time that is remembered, so that no start reads it",
              "touch the file"};
    }
    return {};
  }

  Verdict ofUnmerged(const Claim& claim) const {
    const std::string& file = claim.bundle->file;
    std::string database = m_opened.place.here + registrar::Narrow(vlt::layout::kDatabase);
    std::vector<vltctl::Process> holders = vltctl::LockTable().holders(LockFileOf(database));
    for (const vltctl::Process& holder : holders) {
      std::optional<double> started = StartOf(holder.pid);
      if (!started || *started > ChangeOf(file)) continue;
      return {"process-older-than-file", claim.key, file,
              "is newer than the registrar, which is " + vltctl::HeldBy(holders),
              "start that program again"};
    }
    return {"not-yet-scanned", claim.key, file, "is new or changed since the last start",
            HasChosenRoot() ? "start a program that uses the registrar, on its own machine"
                            : "start a program that uses the registrar, or \"vltctl list --live\""};
  }

  Verdict ofComponent(const Component& c) const {
    const std::string file = FileOf(m_snapshot, c);
    bool isOwn = c.name == registrar::kBuiltInDictionary;
    bool isGone = IsHere(file) && !IsThere(file);
    if (!isOwn && c.registrationFile.empty() && isGone) {
      return {"ghost", c.name, file,
              "is gone; the component came by a call, and no start removes it",
              "end all programs that use the registrar, and remove [" + c.name +
                  "] and its line in [KORComponents] from " + m_snapshot.database.path};
    }
    if (c.guid == kNullGuid) {
      return {"guid-null", c.name, c.registrationFile, "its Identifier is missing, null or no GUID",
              "give it an Identifier of its own"};
    }
    std::string library = LibraryOf(file);
    if (!HasChosenRoot() && !library.empty() && IsForeign(library)) {
      return {"other-architecture", c.name, library, "was built for another kind of machine",
              "install the bundle for this one"};
    }
    std::string note = vltctl::LocaleNote({{c.name, c.name + file}});
    if (!note.empty()) {
      return {"locale", c.name, file, note, "set LANG=C.UTF-8 for that program"};
    }
    return {"registered", c.name, c.registrationFile, "it is registered", ""};
  }

  // Neither a bundle brings it nor does a registrar know it.
  Verdict ofNothing() const {
    std::string from;
    if (m_document.GetItem(registrar::kContents, m_text.c_str(), &from) >= 0 ||
        ofVanishedGuid(&from)) {
      return {"erased-with", m_text, m_opened.place.toHere(from),
              "has vanished or no longer brings it, and its components go with it",
              "install the bundle again"};
    }
    for (const auto& problem : m_snapshot.problems) {
      return {"closed", "", problem.path,
              "may not be read, so that its bundles are not seen: its mode is " +
                  ModeText(problem.path),
              "give all users the right to read it"};
    }
    return {"no-file", "", m_path ? m_path->file : "", "no registration file brings " + m_text,
            "install the bundle that does"};
  }

  bool ofVanishedGuid(std::string* from) const {
    auto wanted = vlt::snapshot::ParseGuid(m_text);
    for (int n = 1; wanted && n <= m_document.GetNumberOfItems(registrar::kContents); ++n) {
      std::string name;
      if (m_document.GetNthItemName(registrar::kContents, n, &name) < 0) continue;
      auto record =
          registrar::ReadRecord(m_document, name, registrar::EmptyFileName::IsNone).identifier;
      if (vlt::snapshot::GuidText(record) != *wanted) continue;
      return m_document.GetItem(registrar::kContents, name.c_str(), from) >= 0;
    }
    return false;
  }

  const Opened& m_opened;
  const Snapshot& m_snapshot;
  const std::string m_text;
  IniDocument m_document;
  std::vector<Bundle> m_bundles;
  std::vector<Claim> m_claims;
  std::optional<Bundle> m_path;
};

Json OrNull(const std::string& text) { return text.empty() ? Json() : Json(text); }

}  // namespace

int Why(const Arguments& arguments, Output& output) {
  Snapshot snapshot = ReadSnapshot();
  Verdict verdict;
  WithFailures([&] {
    vlt::snapshot::WithStandardErrors([&] {
      Opened opened = HasChosenRoot() ? vlt::snapshot::OpenAt(InstallDirectory())
                                      : vlt::snapshot::OpenInForce();
      verdict = Judge(opened, snapshot, arguments.text("COMPONENT")).verdict();
      return 0;
    });
  });
  output.item({{"verdict", verdict.code},
               {"component", OrNull(verdict.component)},
               {"where", OrNull(verdict.where)},
               {"what", verdict.what},
               {"next", OrNull(verdict.next)}});
  std::string component = verdict.component.empty() ? "" : verdict.component + ": ";
  output.line(verdict.code + ": " + component +
              vltctl::TextOf({"", verdict.where, verdict.what, "", verdict.next}));
  return verdict.code == "registered" ? vltctl::kGood : vltctl::kNotFound;
}

}  // namespace admin
