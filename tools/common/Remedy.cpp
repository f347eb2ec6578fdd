#include "tools/common/Remedy.h"

#include <ctype.h>
#include <string.h>

#include <algorithm>

#include "tools/common/Commands.h"

namespace vltctl {
namespace {

// With backslashes, as the command is within quotes already.
std::string ForShell(const std::string& text) {
  std::string out;
  for (char c : text) {
    bool isPlain = (c & 0x80) || isalnum(static_cast<unsigned char>(c)) || strchr("/._-+,:@%=", c);
    out += (isPlain ? "" : "\\") + std::string(1, c);
  }
  return out;
}

// Of "scan --dry-run": whether it is about one installation, which need not be the one in force.
bool TakesRoot(const std::string& words) {
  const std::string name = words.substr(0, words.find(" -"));
  const Command* command = FindCommand(name);
  if (!command || words.find("--live") != std::string::npos) return false;
  return std::any_of(command->arguments.begin(), command->arguments.end(),
                     [](const Argument& a) { return a.name == std::string("--root"); });
}

}  // namespace

std::string RemedyAt(const std::string& root, const std::string& text) {
  const std::string program = "vltctl ";
  if (root.empty()) return text;
  std::string out = text;
  for (size_t at = out.find(program); at != std::string::npos; at = out.find(program, at)) {
    const size_t words = at + program.size();
    const size_t end = at == 0 ? std::string::npos : out.find(out[at - 1], words);
    at = words;
    if (end == std::string::npos || !TakesRoot(out.substr(words, end - words))) continue;
    out.insert(end, " --root " + ForShell(root));
  }
  return out;
}

}  // namespace vltctl
