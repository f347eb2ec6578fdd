// What <vltutils/vltutils.hpp> gives, against the functions below it; exits with 1 at the first difference.
#include <vltutils/vltutils.hpp>

#include <cstdio>
#include <cstdlib>
#include <set>
#include <string>
#include <vector>

namespace {

void Expect(bool good, const char* what) {
  if (good) return;
  std::printf("header: %s\n", what);
  std::exit(1);
}

void Texts() {
  const std::wstring wide = L"path \xE9\x20AC\x1F600";
  const std::string utf8 = "path \xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80";
  Expect(vlt::toUtf8(wide) == utf8 && vlt::toWide(utf8) == wide, "texts");
  Expect(vlt::toUtf8(std::wstring(1, wchar_t{0xD800})) == "\xEF\xBF\xBD", "a surrogate");
  const std::string bad[] = {"\xC0\xAF",         "\x80",    "\xE0\x80\x80", "\xED\xA0\x80",
                             "\xF4\x90\x80\x80", "\xE2\x82"};
  for (const std::string& text : bad) {
    Expect(vlt::toWide(text) == std::wstring(text.size(), L'\xFFFD'), "bytes that are no UTF-8");
  }
  Expect(vlt::toUtf8(static_cast<const wchar_t*>(nullptr)).empty(), "null text");
}

void Results() {
  Expect(vlt::describe(E_POINTER) == "E_POINTER (0x80004003): a required pointer is null",
         "a result");
  Expect(vlt::describe(0x12345678) == "0x12345678", "a number that is no result");
  try {
    vlt::check(E_FAIL, "call");
    Expect(false, "a failure that throws");
  } catch (const vlt::Error& error) {
    Expect(error.result() == E_FAIL && error.code().category() == vlt::category(), "an error");
    Expect(std::string(error.what()).find("call: E_FAIL") == 0, "what an error says");
  }
}

void Guids() {
  const std::string text = "{790F6A90-E0D8-11D3-AA15-005004D131EE}";
  const auto guid = vlt::Guid::parse(text);
  Expect(guid && guid->str() == text, "a GUID");
  Expect(vlt::Guid::parse("790f6a90-e0d8-11d3-aa15-005004d131ee") == guid, "a GUID without braces");
  wchar_t* printed = vltGuidToString(guid->value());
  Expect(vlt::toUtf8(printed) == text, "the library's text of a GUID");
  vltFree(printed);
  for (const char* bad :
       {"", "{790F6A90-E0D8-11D3-AA15-005004D131EE", "790F6A90-E0D8-11D3-AA15-005004D131EG",
        "790F6A90E0D8-11D3-AA15-005004D131EE0"}) {
    Expect(!vlt::Guid::parse(bad), "a text that is no GUID");
  }
  Expect(vlt::Guid() < *guid && vlt::Guid().isNull(), "the null GUID");
}

void Components() {
  const vlt::Registrar registrar = vlt::registrar();
  std::set<std::string> names;
  for (vlt::Type type : {vlt::Dictionary, vlt::ObjectExpert, vlt::ResourceExpert}) {
    for (const vlt::Component& c : registrar.components(type)) {
      names.insert(c.name);
      const auto found = registrar.find(c.guid);
      Expect(found && found->name == c.name && found->type == type && found->file == c.file,
             "a component that is found by its GUID");
      Expect((type == vlt::Dictionary) == c.dictionary.has_value(), "a dictionary's facts");
    }
  }
  Expect(names == std::set<std::string>{"vltdd", "Tank"}, "the components");
  Expect(!registrar.find(vlt::Guid()), "a GUID that names nothing");
  Expect(registrar
             .boundTo(vlt::ObjectExpert, *vlt::Guid::parse("11111111-2222-3333-4444-555555555555"))
             .empty(),
         "a class without experts");
  Expect(!registrar.configurationPath().empty(), "the configuration's path");
  // The copy keeps the object.
  const vlt::Registrar copy = registrar;
  Expect(copy.get() == registrar.get(), "a copy");
}

void Settings() {
  Expect(vlt::localEndpoints().endpoint == "61900", "the local endpoint");
  Expect(vlt::cacheSettings().bufferBytes == 33554432, "the size of the cache");
  // Where the machine cannot make GUIDs there is none, and the failure is that of the function.
  GUID identity{};
  const HRESULT result = vltGetServerIdentity(&identity);
  try {
    Expect(vlt::serverIdentity() == vlt::Guid(identity) && result >= 0, "the identity");
  } catch (const vlt::Error& error) {
    Expect(error.result() == result, "the result of an identity that cannot be made");
  }
  try {
    vlt::localEndpoints(4);
    Expect(false, "an index without settings");
  } catch (const vlt::Error& error) {
    Expect(error.result() == E_FAIL, "the result of an index without settings");
  }
}

}  // namespace

int main() {
  Texts();
  Results();
  Guids();
  Components();
  Settings();
  std::puts("<vltutils/vltutils.hpp>: texts, results, GUIDs, components and settings are right");
}
