#include "tools/vltctl/Picture.h"

#include <utility>

#include "source/Utilities/vltSettingsKeys.h"
#include "tools/vltctl/Components.h"
#include "tools/vltctl/GuardedFiles.h"
#include "tools/vltctl/Reading.h"
#include "vlloader/source/InstallLayout.h"
#include "zt/fnd/String.h"

namespace admin {
namespace {

using vltctl::Json;

std::string NameOf(const Json& component) {
  std::string text;
  for (const char* part : {"type", "name", "guid"}) {
    text += (text.empty() ? "" : " ") + component[part].get<std::string>();
  }
  return text;
}

void AddPending(const char* does, const std::vector<Component>& components, Picture* picture) {
  for (const Component& component : components) {
    picture->pending[component.guid] = std::string(does) + " " + NameOf(ToJson(component));
  }
}

void AddStart(Picture* picture) {
  vlt::snapshot::Start start = Rehearse();
  AddPending("adds", start.added, picture);
  AddPending("changes", start.changed, picture);
  for (const std::string& file : start.setAside) {
    picture->pending[file] = "sets aside " + file + ", which cannot be parsed";
  }
  for (const std::string& file : start.skipped) {
    picture->pending[file] = "skips " + file + ", which cannot be read";
  }
}

void AddSettings(Picture* picture) {
  const std::string file = DataFile(zt::fnd::AnsiString(vlt::layout::kSettings).c_str());
  for (const auto& [key, value] : Document(ReadGuarded(file).bytes).items(settings::kSection)) {
    picture->settings[key] = value;
  }
}

// What is in both, in one, and in the other.
template <class Map, class Each>
void ForEachKey(const Map& before, const Map& after, Each each) {
  std::set<std::string> keys;
  for (const auto& [key, value] : before) keys.insert(key);
  for (const auto& [key, value] : after) keys.insert(key);
  auto in = [](const Map& map, const std::string& key) {
    auto found = map.find(key);
    return found == map.end() ? Json() : Json(found->second);
  };
  for (const std::string& key : keys) {
    Json was = in(before, key), is = in(after, key);
    if (was != is) each(key, was, is);
  }
}

std::string OrNotSet(const Json& value) {
  return value.is_null() ? "(not set)" : value.get<std::string>();
}

}  // namespace

Picture TakePicture() {
  Picture picture;
  Snapshot snapshot = ReadSnapshot();
  for (const Component& component : snapshot.components) {
    picture.components[component.guid] = ToJson(component);
  }
  picture.database = WordsOf(Inspect(snapshot.database.path).kind).code;
  AddSettings(&picture);
  AddStart(&picture);
  return picture;
}

std::vector<Change> Differences(const Picture& before, const Picture& after) {
  std::vector<Change> changes;
  if (before.database != after.database) {
    changes.push_back({"database", "database: " + before.database + " -> " + after.database, "",
                       before.database, after.database});
  }
  std::set<std::string> registered;  // what was pending and came to be
  ForEachKey(before.components, after.components,
             [&](const std::string& guid, const Json& was, const Json& is) {
               const char* what = was.is_null() ? "added" : is.is_null() ? "removed" : "changed";
               changes.push_back({what, std::string(what) + ": " + NameOf(is.is_null() ? was : is),
                                  guid, was, is});
               registered.insert(guid);
             });
  ForEachKey(
      before.settings, after.settings,
      [&](const std::string& key, const Json& was, const Json& is) {
        changes.push_back({"setting",
                           "settings changed: " + key + " " + OrNotSet(was) + " -> " + OrNotSet(is),
                           key, was, is});
      });
  ForEachKey(before.pending, after.pending,
             [&](const std::string& subject, const Json& was, const Json& is) {
               if (!is.is_null()) {
                 changes.push_back(
                     {"pending", "the next start " + is.get<std::string>(), subject, was, is});
               } else if (!registered.count(subject)) {
                 changes.push_back({"no-longer-pending",
                                    "the next start no longer " + was.get<std::string>(), subject,
                                    was, is});
               }
             });
  return changes;
}

}  // namespace admin
