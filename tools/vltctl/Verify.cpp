// verify and repair: guarded files and their sidecars.
#include <errno.h>
#include <fcntl.h>
#include <iconv.h>
#include <string.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <memory>

#include "source/Cmd5vlt.h"
#include "source/Common/vltFileSecurity.h"
#include "source/DurableCopy.h"
#include "tools/vltctl/Content.h"
#include "tools/vltctl/GuardedFiles.h"
#include "tools/vltctl/Reading.h"
#include "tools/vltctl/Root.h"
#include "zt/posix/Files.h"

namespace admin {
namespace {

using Kind = GuardedIniState::Kind;
using Opening = GuardedIniState::Opening;
using vltctl::ExitCode;
using vltctl::Json;
using zt::posix::ScopedFd;

Json OrNull(const std::string& text) { return text.empty() ? Json() : Json(text); }

ExitCode CodeOf(const GuardedIniState& state) {
  if (state.opening == Opening::Takes || state.opening == Opening::TakesCopy) {
    return vltctl::kGood;
  }
  return state.opening == Opening::Begins ? vltctl::kNotFound : vltctl::kDataUnusable;
}

vltctl::Mood MoodOf(const GuardedIniState& state) {
  if (CodeOf(state) == vltctl::kDataUnusable) return vltctl::Mood::Bad;
  bool isUsual = state.kind == Kind::Sound || state.kind == Kind::NoSidecar;
  return isUsual ? vltctl::Mood::Good : vltctl::Mood::Doubtful;
}

std::vector<std::string> FilesOf(const Arguments& arguments) {
  std::vector<std::string> files = arguments.list("FILE");
  if (!files.empty() && HasChosenRoot()) {
    throw vltctl::Failure(vltctl::kUsage, {"usage", "", "--root goes without files",
                                           "it is for those of the installation", ""});
  }
  if (!files.empty() && !arguments.has("--all")) return files;
  if (files.empty()) {
    // Those of the installation that are there: a setting or a jar that nothing has made yet is missing
    // nowhere.
    for (const std::string& file : GuardedFiles()) {
      if (Inspect(file).kind != Kind::Missing) files.push_back(file);
    }
    return files;
  }
  throw vltctl::Failure(vltctl::kUsage,
                        {"usage", "", "--all goes without files", "", "give --all, or the files"});
}

constexpr const char* kNoFiles =
    "there is no database, jar or settings file yet; programs make them when they need them";

std::string Sentence(const GuardedIniState& state) {
  std::string why = WhyOf(state);
  return WordsOf(state.kind).found + (why.empty() ? "" : ": " + why);
}

}  // namespace

int Verify(const Arguments& arguments, Output& output) {
  if (arguments.has("--content")) return VerifyContent(arguments, output);
  int code = vltctl::kGood;
  const std::vector<std::string> files = FilesOf(arguments);
  if (files.empty()) output.line(kNoFiles);
  for (const std::string& file : files) {
    GuardedIniState state = Inspect(file);
    const StateWords& words = WordsOf(state.kind);
    const OpeningWords& opening = WordsOf(state.opening);
    const std::string next = output.remedy(words.next);
    output.item({{"file", file},
                 {"state", words.code},
                 {"found", words.found},
                 {"why", OrNull(WhyOf(state))},
                 {"opening", opening.code},
                 {"nextOpen", opening.text},
                 {"next", OrNull(next)}});
    output.line(file + ": ", Sentence(state), MoodOf(state),
                std::string("; the next open ") + opening.text);
    if (!next.empty()) output.line("  " + next);
    code = std::max<int>(code, CodeOf(state));
  }
  return code;
}

// ---- repair

namespace {

// What a repair does about a state.
enum class Remedy { None, Seal, Convert, TakeUp, Impossible };

Remedy RemedyFor(Kind kind) {
  switch (kind) {
    case Kind::FirstSave:
    case Kind::DigestDiffers:
    case Kind::SidecarShort:
    case Kind::SidecarDirectory:
      return Remedy::Seal;
    case Kind::Unparsable:
    case Kind::UnparsableChanged:
      return Remedy::Convert;
    case Kind::DurableCopy:
      return Remedy::TakeUp;
    case Kind::Unreadable:
    case Kind::SidecarUnreadable:
      return Remedy::Impossible;
    default:
      return Remedy::None;
  }
}

constexpr const char* WordOf(Remedy remedy) {
  constexpr const char* words[] = {"none", "seal", "convert", "take-up", "impossible"};
  return words[static_cast<int>(remedy)];
}

void WriteNew(const std::string& file, const std::string& bytes) {
  ScopedFd fd = zt::posix::CreateNew(file.c_str(), O_WRONLY, 0666);
  bool written =
      fd && zt::posix::WriteAll(fd.get(), bytes.data(), bytes.size()) && zt::posix::Sync(fd.get());
  if (!written) throw CannotWrite(file, errno);
  zt::posix::SetSharedMode(fd.get(), kSharedMode);
}

// A name beside the file that is not taken: FILE.20260131-235959.copy.
std::string FreeName(const std::string& file) {
  char stamp[32];
  time_t now = time(nullptr);
  struct tm local;
  strftime(stamp, sizeof stamp, ".%Y%m%d-%H%M%S", localtime_r(&now, &local));
  for (int number = 0;; ++number) {
    std::string name = file + stamp + (number ? "." + std::to_string(number) : "") + ".copy";
    if (access(name.c_str(), F_OK) != 0) return name;
  }
}

// The text in UTF-8; empty if it is not what its byte order mark announces.
std::string Converted(const std::string& bytes) {
  bool isUtf32 = bytes.starts_with(std::string("\xFF\xFE\0\0", 4)) ||
                 bytes.starts_with(std::string("\0\0\xFE\xFF", 4));
  iconv_t converter = iconv_open("UTF-8", isUtf32 ? "UTF-32" : "UTF-16");
  if (converter == reinterpret_cast<iconv_t>(-1)) return "";
  std::string out(bytes.size() * 2 + 4, '\0');
  char *from = const_cast<char*>(bytes.data()), *to = out.data();
  size_t left = bytes.size(), space = out.size();
  size_t result = iconv(converter, &from, &left, &to, &space);
  iconv_close(converter);
  if (result == static_cast<size_t>(-1) || left > 0) return "";
  out.resize(out.size() - space);
  return out;
}

// Durable under another name first, then in the file's place.
void Replace(const std::string& file, const std::string& bytes) {
  const std::string temporary = file + ".TMP";
  if (zt::posix::MakeRoom(temporary.c_str()) != 0) throw CannotWrite(temporary, errno);
  WriteNew(temporary, bytes);
  if (zt::posix::Rename(temporary.c_str(), file.c_str()) != 0) throw CannotWrite(file, errno);
  zt::posix::SyncDirectoryOf(file.c_str());
}

void Seal(const std::string& file, const std::string& bytes) {
  const std::string sidecar = CvlIniMgr::SidecarName(file);
  IniSidecar::Digest digest;
  Cmd5vlt md5;
  md5.addString(reinterpret_cast<const unsigned char*>(bytes.data()),
                static_cast<unsigned>(bytes.size()));
  md5.getDigest(digest.data());
  // A directory in its place becomes NAME.bad.
  errno = 0;
  if (Inspect(file).kind == Kind::SidecarDirectory && zt::posix::MakeRoom(sidecar.c_str()) != 0) {
    throw CannotWrite(sidecar, errno);
  }
  if (IniSidecar::Write(sidecar, digest, true) < 0) throw CannotWrite(sidecar, errno);
}

struct Repaired {
  Remedy remedy = Remedy::None;
  std::string copy;
};

// The second name takes the file's; what it replaces, if there is anything, is kept.
Repaired TakeUp(const std::string& file) {
  Repaired out;
  out.remedy = Remedy::TakeUp;
  GuardedBytes read = ReadGuarded(file);
  if (read.state == GuardedBytes::State::Read) {
    out.copy = FreeName(file);
    WriteNew(out.copy, read.bytes);
  }
  errno = 0;
  if (!DurableCopy::takeUp(file) || Inspect(file).kind == Kind::DurableCopy) {
    throw CannotWrite(file, errno);
  }
  if (Inspect(file).kind != Kind::Sound) Seal(file, ReadGuarded(file).bytes);
  return out;
}

bool HasWork(Remedy remedy) { return remedy != Remedy::None && remedy != Remedy::Impossible; }

// The caller holds the file's lock, so that nothing changes between the judgement and its remedy.
Repaired Repair(const std::string& file) {
  Repaired out;
  out.remedy = RemedyFor(Inspect(file).kind);
  if (out.remedy == Remedy::TakeUp) return TakeUp(file);
  if (!HasWork(out.remedy)) return out;
  GuardedBytes read = ReadGuarded(file);
  if (read.state != GuardedBytes::State::Read) throw Unusable(file, read.error);
  bool isText = Document(read.bytes).status() == 0;
  std::string text = isText ? read.bytes : Converted(read.bytes);
  if (text.empty() && !read.bytes.empty()) {
    out.remedy = Remedy::Impossible;
    return out;
  }
  out.remedy = isText ? Remedy::Seal : Remedy::Convert;
  out.copy = FreeName(file);
  WriteNew(out.copy, read.bytes);
  if (!isText) Replace(file, text);
  Seal(file, text);
  return out;
}

std::string Sentence(Remedy remedy, bool dry) {
  switch (remedy) {
    case Remedy::Seal:
      return dry ? "would get a new sidecar" : "has a new sidecar";
    case Remedy::TakeUp:
      return dry ? "would be NAME.durable" : "is what was NAME.durable";
    default:
      return dry ? "would be converted to UTF-8" : "is converted to UTF-8";
  }
}

void Show(const std::string& file, const GuardedIniState& before, const Repaired& done, bool dry,
          Output& output) {
  const char* after = dry ? nullptr : WordsOf(Inspect(file).kind).code;
  output.item({{"file", file},
               {"state", WordsOf(before.kind).code},
               {"action", WordOf(done.remedy)},
               {"done", !dry},
               {"copy", OrNull(done.copy)},
               {"after", after ? Json(after) : Json()}});
  std::string line = file + ": " + Sentence(before) + ": ";
  switch (done.remedy) {
    case Remedy::None:
      line += "nothing to do";
      break;
    case Remedy::Impossible:
      line += "cannot be repaired; " + output.remedy(WordsOf(before.kind).next);
      break;
    default:
      line += Sentence(done.remedy, dry);
      if (!done.copy.empty()) line += "; what it was is " + done.copy;
  }
  output.line(line);
}

int RepairOne(const std::string& file, bool dry, Output& output) {
  GuardedIniState before = Inspect(file);
  Repaired done{RemedyFor(before.kind), ""};
  bool hasWork = HasWork(done.remedy);
  if (hasWork && !dry) {
    FileHold hold(file);
    before = Inspect(file);
    done = Repair(file);
  }
  Show(file, before, done, dry, output);
  if (done.remedy == Remedy::Impossible) return vltctl::kDataUnusable;
  return hasWork && dry ? vltctl::kNotFound : vltctl::kGood;
}

}  // namespace

int Repair(const Arguments& arguments, Output& output) {
  int code = vltctl::kGood;
  const std::vector<std::string> files = FilesOf(arguments);
  if (files.empty()) output.line(kNoFiles);
  for (const std::string& file : files) {
    code = std::max(code, RepairOne(file, arguments.has("--dry-run"), output));
  }
  return code;
}

}  // namespace admin
