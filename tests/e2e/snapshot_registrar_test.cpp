// The snapshot reader beside the registrar: on random installations, over several starts, both give
// the same answers, field by field.
#include <gtest/gtest.h>
#include <locale.h>
#include <string.h>

#include <nlohmann/json.hpp>

#include "tests/e2e/RandomInstallation.h"
#include "tests/e2e/Start.h"
#include "tests/support/Tracing.h"

namespace vlt::test {
namespace {

using nlohmann::json;

// The registrar's texts in UTF-8, without the library.
std::string Utf8(const wchar_t* text) {
  std::string out;
  for (; *text; ++text) {
    auto c = static_cast<uint32_t>(*text);
    if (c < 0x80) {
      out += static_cast<char>(c);
      continue;
    }
    int more = c < 0x800 ? 1 : c < 0x10000 ? 2 : 3;
    out += static_cast<char>((more == 1 ? 0xC0 : more == 2 ? 0xE0 : 0xF0) | (c >> 6 * more));
    while (more-- > 0) out += static_cast<char>(0x80 | (c >> 6 * more & 0x3F));
  }
  return out;
}

json TextOrNull(const wchar_t* text) { return text ? json(Utf8(text)) : json(); }

std::string GuidText(GUID guid) {
  wchar_t* text = vltGuidToString(guid);
  std::string out = Utf8(text);
  vltFree(text);
  return out;
}

struct TypeRow {
  _vltComponentType type;
  const char* name;
};
constexpr TypeRow kTypes[] = {{vltComponentDataDictionary, "dictionary"},
                              {vltComponentObjectExpert, "object expert"},
                              {vltComponentResourceExpert, "resource expert"}};

json Fields(const _vltComponent2& c, const char* type) {
  json out = {{"type", type},
              {"name", TextOrNull(c.name)},
              {"guid", GuidText(c.identifier)},
              {"file", TextOrNull(c.fileName)},
              {"version", c.version}};
  if (c.type == vltComponentDataDictionary) {
    out["schemaVersion"] = c.dictionary.schemaVersion;
    out["fragmentRegistered"] = c.dictionary.fragmentRegistered;
    out["lastInstalledSchemaVersion"] = c.dictionary.lastInstalledSchemaVersion;
    out["prefix"] = TextOrNull(c.dictionary.prefix);
  }
  if (c.type == vltComponentResourceExpert) out["pnp"] = TextOrNull(c.resource.pnp);
  return out;
}

void AddComponents(IvltRegistrar& registrar, const TypeRow& row, json* components) {
  IvltEnumComponent* enumerator = nullptr;
  ASSERT_EQ(registrar.EnumComponents(row.type, &enumerator), S_OK);
  for (;;) {
    Received next, same;
    unsigned fetched = 0;
    if (enumerator->Next(1, &next.value, &fetched) != S_OK) break;
    json fields = Fields(next.value, row.name);
    ASSERT_EQ(registrar.GetComponent(next.value.identifier, &same.value), S_OK);
    EXPECT_EQ(Fields(same.value, row.name), fields);
    components->push_back(fields);
  }
  enumerator->Release();
}

json BindingsOf(IvltRegistrar& registrar) {
  json out = json::object();
  void* raw = nullptr;
  EXPECT_EQ(registrar.QueryInterface(IID_IvltDynamicRegistrar, &raw), S_OK);
  auto* dynamic = static_cast<IvltDynamicRegistrar*>(raw);
  std::vector<GUID> classes = {GUID_NULL};
  for (unsigned n = 0; n < RandomInstallation::kIdentifiers; ++n) classes.push_back(G(n));
  for (const TypeRow& row : kTypes) {
    for (const GUID& bindingClass : classes) {
      unsigned count = 0;
      GUID* found = nullptr;
      if (dynamic->GetComponentsForBindingClass(row.type, bindingClass, &count, &found) < 0)
        continue;
      json& list = out[row.name][GuidText(bindingClass)];
      for (unsigned i = 0; i < count; ++i) list.push_back(GuidText(found[i]));
      vltFree(found);
    }
  }
  dynamic->Release();
  return out;
}

json PreviousOf(IvltRegistrar& registrar) {
  void* raw = nullptr;
  EXPECT_EQ(registrar.QueryInterface(IID_IvltDowngradeRegistrar, &raw), S_OK);
  auto* downgrade = static_cast<IvltDowngradeRegistrar*>(raw);
  json out = json::array();
  unsigned count = 0;
  wchar_t** paths = nullptr;
  downgrade->GetPreviousDictionaries(nullptr, &count, &paths);
  for (unsigned i = 0; i < count; ++i) {
    out.push_back(Utf8(paths[i]));
    vltFree(paths[i]);
  }
  vltFree(paths);
  downgrade->Release();
  return out;
}

json Answers(IvltRegistrar& registrar) {
  json out;
  out["components"] = json::array();
  for (const TypeRow& row : kTypes) AddComponents(registrar, row, &out["components"]);
  out["bindings"] = BindingsOf(registrar);
  out["previousDictionaries"] = PreviousOf(registrar);
  unsigned schemaVersion = 0;
  EXPECT_EQ(registrar.GetSchemaVersion(&schemaVersion), S_OK);
  out["schemaVersion"] = schemaVersion;
  out["cacheSizeBytes"] = CacheSize(registrar);
  wchar_t* path = nullptr;
  EXPECT_EQ(registrar.GetConfigurationPath(&path), S_OK);
  out["configurationFile"] = TextOrNull(path);
  vltFree(path);
  return out;
}

// Each type in the order of its enumerator; the reader has all types in one order.
json ByType(const json& components) {
  json out = json::object();
  for (const json& component : components) {
    out[component["type"].get<std::string>()].push_back(component);
  }
  return out;
}

class Comparison {
 public:
  Comparison(const RandomInstallation& installation, const char* locale)
      : m_installation(installation), m_locale(locale) {}

  // One start; what it answers, and what `then` does with it. Null if it has no registrar.
  json start(const std::function<void(IvltRegistrar&)>& then = {}) {
    std::string out = m_installation.root() + ".answers";
    unlink(out.c_str());
    ExpectInChild([&] {
      ASSERT_NE(setlocale(LC_ALL, m_locale), nullptr);
      IvltRegistrar* registrar = nullptr;
      if (GetRegistrar(&registrar) != "ok") return WriteBytes(out, "null");
      WriteBytes(out, Answers(*registrar).dump());
      if (then) then(*registrar);
      registrar->Release();
    });
    return json::parse(ReadBytes(out));
  }

  json snapshot() const {
    ProgramResult result =
        RunProgram({std::string(VLT_TEST_BIN) + "/snapshot_client", m_installation.root()},
                   {{"LC_ALL", m_locale}});
    EXPECT_EQ(result.exitCode, 0) << result.err;
    return result.exitCode == 0 ? json::parse(result.out) : json();
  }

  static void expectSame(const json& snapshot, const json& answers, const std::string& where) {
    for (const char* key : {"bindings", "previousDictionaries", "schemaVersion", "cacheSizeBytes",
                            "configurationFile"}) {
      EXPECT_EQ(snapshot[key], answers[key]) << where << ": " << key;
    }
    EXPECT_EQ(ByType(snapshot["components"]), ByType(answers["components"])) << where;
  }

 private:
  const RandomInstallation& m_installation;
  const char* m_locale;
};

// Registers by calls, as installers do.
void Register(IvltRegistrar& registrar, RandomInstallation& installation) {
  for (unsigned n = installation.any(3); n > 0; --n) {
    _vltComponentType type = kTypes[installation.any(3)].type;
    Offered offered(type, n == 1 ? L"By call" : L"Tank", G(installation.any(6)), L"/x/Called.vle",
                    L"extra");
    registrar.RegisterComponent(&offered.value);
  }
  if (installation.any(4) == 0) SetCacheSize(registrar, installation.any(1000));
}

void CompareOne(unsigned seed, int rounds, int* compared) {
  RandomInstallation installation(seed);
  const char* locale = seed % 4 == 0 ? "C" : "C.UTF-8";
  Comparison comparison(installation, locale);
  for (int round = 0; round < rounds; ++round) {
    std::string where = "seed " + std::to_string(seed) + ", round " + std::to_string(round);
    // What this start saves, and merges no more, the next one reads.
    unsigned keep = installation.any(1000);
    comparison.start([&](IvltRegistrar& r) {
      if (keep % 2) Register(r, installation);
    });
    json snapshot = comparison.snapshot();
    json answers = comparison.start();
    if (answers.is_null()) {
      EXPECT_EQ(snapshot["components"], json::array()) << where;
      continue;
    }
    // A start that sets a database aside answers nothing; the one after it merges all again.
    if (snapshot["changes"] == 0) {
      Comparison::expectSame(snapshot, answers, where);
      // And what that start has saved gives the same again.
      Comparison::expectSame(comparison.snapshot(), answers, where + ", after");
      ++*compared;
    }
    installation.change();
    installation.damage();
  }
}

TEST(SnapshotRegistrar, BothGiveTheSameAnswers) {
  const unsigned count = FullSize() ? 1000 : 50;
  int compared = 0;
  for (unsigned seed = 1; seed <= count && !testing::Test::HasFailure(); ++seed) {
    CompareOne(seed, FullSize() ? 2 : 3, &compared);
  }
  EXPECT_GT(compared, static_cast<int>(count));
  RecordProperty("compared", compared);
}

}  // namespace
}  // namespace vlt::test
