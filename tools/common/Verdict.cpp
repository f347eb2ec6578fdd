#include "tools/common/Verdict.h"

namespace vltctl {
namespace {

Json OrNull(const std::string& text) { return text.empty() ? Json() : Json(text); }

}  // namespace

Verdict Bad(const char* code, const std::string& message) {
  Verdict out;
  out.code = code;
  out.messages.push_back(message);
  return out;
}

void Show(const Json& component, const Verdict& verdict, Output& output) {
  Json item = component;
  item["sound"] = verdict.code.empty();
  item["code"] = OrNull(verdict.code);
  item["library"] = OrNull(verdict.library);
  item["messages"] = verdict.messages;
  item["notes"] = verdict.notes;
  output.item(item);
  const std::string name =
      component["type"].get<std::string>() + " " + component["name"].get<std::string>();
  bool isSound = verdict.code.empty();
  output.line(name + ": ", isSound ? "sound" : "NOT SOUND", isSound ? Mood::Good : Mood::Bad, "");
  for (const std::string& text : verdict.messages) output.line("  " + text);
  for (const std::string& text : verdict.notes) output.line("    " + text);
  output.flush();
}

std::string Summary(size_t all, size_t bad) {
  std::string text = std::to_string(all) + (all == 1 ? " component: " : " components: ");
  if (bad == 0) return text + (all == 1 ? "sound" : "all sound");
  return text + std::to_string(bad) + " not sound";
}

}  // namespace vltctl
