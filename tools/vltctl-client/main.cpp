// The commands of vltctl that are calls of the library: what the registrar of this machine knows.
#include <locale.h>
#include <stdio.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <nlohmann/json.hpp>

#include "tools/common/Commands.h"
#include "tools/common/Terminal.h"
#include "tools/common/Usage.h"
#include "tools/vltctl-client/Check.h"
#include "tools/vltctl-client/Component.h"
#include "zt/fnd/Exception.h"

namespace {

using nlohmann::json;
using vltctl::Client;
using vltctl::Component;
using vltctl::ForTerminal;
using vltctl::kDataUnusable;
using vltctl::kGood;
using vltctl::kNotFound;
using vltctl::kUsage;

json ToJson(const Component& c) {
  json out = {{"type", c.type}, {"name", c.name}, {"guid", c.guid}, {"file", c.file}};
  if (c.schemaVersion) {
    out["schemaVersion"] = *c.schemaVersion;
    out["changed"] = *c.fragmentRegistered != 0;
    out["lastInstalledSchemaVersion"] = *c.lastInstalledSchemaVersion;
    out["prefix"] = *c.prefix;
  }
  if (c.pnp) out["pnp"] = *c.pnp;
  return out;
}

json ToJson(const std::vector<Component>& components) {
  json out = json::array();
  for (const Component& c : components) out.push_back(ToJson(c));
  return out;
}

// JSON demands UTF-8; what a file name holds beyond it is shown as a replacement character.
void Print(const json& value) {
  puts(value.dump(2, ' ', false, json::error_handler_t::replace).c_str());
}

void PrintTable(const std::vector<Component>& components) {
  std::vector<std::vector<std::string>> rows = {{"TYPE", "NAME", "GUID", "VERSION", "FILE"}};
  for (const Component& c : components) {
    std::string version = c.schemaVersion ? std::to_string(*c.schemaVersion) : "-";
    rows.push_back({ForTerminal(c.type), ForTerminal(c.name), ForTerminal(c.guid), version,
                    c.file.empty() ? "-" : ForTerminal(c.file)});
  }
  std::vector<size_t> widths(rows[0].size());
  for (const auto& row : rows) {
    for (size_t i = 0; i < row.size(); ++i) widths[i] = std::max(widths[i], row[i].size());
  }
  for (const auto& row : rows) {
    for (size_t i = 0; i + 1 < row.size(); ++i) {
      printf("%-*s  ", static_cast<int>(widths[i]), row[i].c_str());
    }
    printf("%s\n", row.back().c_str());
  }
}

void PrintOne(const Component& c) {
  auto line = [](const char* name, const std::string& value) {
    printf("%-26s %s\n", name, ForTerminal(value).c_str());
  };
  line("type", c.type);
  line("name", c.name);
  line("guid", c.guid);
  line("file", c.file);
  if (c.schemaVersion) {
    line("schema version", std::to_string(*c.schemaVersion));
    line("changed since reset", *c.fragmentRegistered ? "yes" : "no");
    line("last installed version", *c.lastInstalledSchemaVersion == 0xFFFFFFFF
                                       ? "none"
                                       : std::to_string(*c.lastInstalledSchemaVersion));
    line("prefix", *c.prefix);
  }
  if (c.pnp) line("pnp", *c.pnp);
}

int List(bool asJson) {
  Client client;
  auto components = client.list();
  double readyMs = static_cast<double>(client.timeToReady().count()) / 1000;
  if (asJson) {
    Print({{"components", ToJson(components)}, {"readyMs", readyMs}});
  } else {
    PrintTable(components);
    printf("%zu components; scanned in %.1f ms\n", components.size(), readyMs);
  }
  return kGood;
}

int Show(const std::string& guid, bool asJson) {
  auto component = Client().find(guid);
  if (!component) {
    fprintf(stderr, "vltctl: no component %s\n", ForTerminal(guid).c_str());
    return kNotFound;
  }
  if (asJson) {
    Print(ToJson(*component));
  } else {
    PrintOne(*component);
  }
  return kGood;
}

int Classes(const std::string& guid, bool asJson) {
  auto components = Client().classes(guid);
  if (components.empty()) {
    fprintf(stderr, "vltctl: no component binds to %s\n", ForTerminal(guid).c_str());
    return kNotFound;
  }
  if (asJson) {
    Print(ToJson(components));
  } else {
    PrintTable(components);
  }
  return kGood;
}

json ToJson(const vltctl::Finding& finding) {
  json out = ToJson(finding.component);
  out["sound"] = finding.sound;
  out["messages"] = finding.messages;
  out["notes"] = finding.notes;
  return out;
}

int Check(const std::string& guid, bool asJson) {
  Client client;
  auto findings = vltctl::CheckComponents(
      client, guid.empty() ? std::nullopt : std::optional<std::string>(guid));
  if (findings.empty()) {
    fprintf(stderr, "vltctl: no component %s\n", ForTerminal(guid).c_str());
    return kNotFound;
  }
  bool sound = true;
  json all = json::array();
  for (const vltctl::Finding& finding : findings) {
    sound = sound && finding.sound;
    all.push_back(ToJson(finding));
    if (asJson) continue;
    printf("%s %s: %s\n", finding.component.type.c_str(),
           ForTerminal(finding.component.name).c_str(), finding.sound ? "sound" : "NOT SOUND");
    for (const std::string& text : finding.messages) printf("  %s\n", ForTerminal(text).c_str());
    for (const std::string& text : finding.notes) printf("    %s\n", ForTerminal(text).c_str());
  }
  if (asJson) Print(all);
  return sound ? kGood : kDataUnusable;
}

int Url(bool asJson) {
  wchar_t* url = nullptr;
  HRESULT result = vltGetLocalConfigurationURL(&url);
  std::string text = vltctl::NarrowText(url);
  vltFree(url);
  if (asJson) {
    Print({{"url", text}});
  } else {
    printf("%s\n", ForTerminal(text).c_str());
  }
  return result < 0 ? kDataUnusable : kGood;
}

int Identity(bool asJson) {
  GUID identity = {};
  if (vltGetServerIdentity(&identity) < 0) {
    fprintf(stderr, "vltctl: no identity is available\n");
    return kDataUnusable;
  }
  std::string text = vltctl::GuidText(identity);
  if (asJson) {
    Print({{"identity", text}});
  } else {
    printf("%s\n", text.c_str());
  }
  return kGood;
}

struct Arguments {
  bool json = false;
  std::string guid;
};

int Run(int argc, char** argv) {
  Arguments arguments;
  CLI::App app("Shows what the component registrar of this machine knows.", "vltctl");
  app.set_version_flag("--version", VLTCTL_VERSION);
  app.require_subcommand(1);
  CLI::Validator guid(
      [](const std::string& text) {
        return vltctl::IsGuid(text) ? std::string() : "not a GUID: " + text;
      },
      "GUID");
  auto command = [&](const char* name, const char* description) {
    CLI::App* sub = app.add_subcommand(name, description);
    sub->add_flag("--json", arguments.json, "Print JSON");
    return sub;
  };
  CLI::App* list = command("list", "All components");
  CLI::App* show = command("show", "One component");
  show->add_option("guid", arguments.guid, "Identifier, with or without braces")
      ->required()
      ->check(guid);
  CLI::App* classes = command("classes", "The experts that bind to a class of objects");
  classes->add_option("guid", arguments.guid, "Identifier of the class")->required()->check(guid);
  CLI::App* check = command("check", "Do the components' files and entry points stand?");
  check->add_option("guid", arguments.guid, "One component; all without")->check(guid);
  CLI::App* url = command("url", "Where the local server listens");
  CLI::App* identity = command("identity", "Identity of this machine's server");
  // Listed for the help; the command itself has done them before this program is asked.
  for (const auto& [name, summary] : vltctl::kFileCommands) command(name, summary);
  app.footer("Exit codes: 0 good, 1 not found, 2 usage, 3 the installation's data cannot be used.");
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& error) {
    // CLI11's own codes are many; a usage error has one here, and --help and --version are none.
    return vltctl::ExitOf(app, error) == 0 ? kGood : kUsage;
  }
  if (list->parsed()) return List(arguments.json);
  if (check->parsed()) return Check(arguments.guid, arguments.json);
  if (url->parsed()) return Url(arguments.json);
  if (identity->parsed()) return Identity(arguments.json);
  if (show->parsed()) return Show(arguments.guid, arguments.json);
  if (classes->parsed()) return Classes(arguments.guid, arguments.json);
  return kUsage;
}

}  // namespace

int main(int argc, char** argv) {
  setlocale(LC_ALL, "");
  try {
    return Run(argc, argv);
  } catch (const zt::fnd::exception::Exception& error) {
    // What the library throws says that files are not as they should be.
    fprintf(stderr, "vltctl: %s\n", ForTerminal(error.what()).c_str());
  } catch (const vltctl::DataUnusable& error) {
    fprintf(stderr, "vltctl: %s\n", ForTerminal(error.what()).c_str());
  } catch (int) {
    fprintf(stderr, "vltctl: the registration database cannot be opened\n");
  } catch (const std::exception& error) {
    fprintf(stderr, "vltctl: %s\n", ForTerminal(error.what()).c_str());
  }
  return kDataUnusable;
}
