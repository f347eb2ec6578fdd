#include "tools/vltctl-client/Component.h"

#include <stdlib.h>
#include <string.h>

#include <memory>

namespace vltctl {

namespace {

template <class T>
using Text = std::unique_ptr<T, decltype(&vltFree)>;

}  // namespace

std::string NarrowText(const wchar_t* text) {
  if (!text) return "";
  size_t size = wcstombs(nullptr, text, 0);
  if (size != static_cast<size_t>(-1)) {
    std::string out(size, '\0');
    wcstombs(out.data(), text, size);
    return out;
  }
  std::string out;  // The locale lacks a character: show what it has.
  for (; *text; ++text) out += *text > 0 && *text < 0x80 ? static_cast<char>(*text) : '?';
  return out;
}

std::string GuidText(GUID guid) {
  Text<wchar_t> text(vltGuidToString(guid), &vltFree);
  return NarrowText(text.get());
}

GUID ParseGuid(const std::string& text) {
  return vltGuidFromString(std::wstring(text.begin(), text.end()).c_str());
}

namespace {

Failure Unusable(const char* what, const char* next) {
  return {kDataUnusable, {"registrar", "", what, "", next}};
}

template <class T>
struct ReleaseInterface {
  void operator()(T* p) const { p->Release(); }
};
template <class T>
using Held = std::unique_ptr<T, ReleaseInterface<T>>;

struct TypeName {
  _vltComponentType type;
  const char* name;
};
constexpr TypeName kTypes[] = {{vltComponentDataDictionary, "dictionary"},
                               {vltComponentObjectExpert, "object expert"},
                               {vltComponentResourceExpert, "resource expert"},
                               {vltComponentUIProvider, "UI provider"}};

const char* NameOf(_vltComponentType type) {
  for (const TypeName& row : kTypes) {
    if (row.type == type) return row.name;
  }
  return "unknown";
}

// A record filled by the registrar; ends its texts.
struct Record {
  _vltComponent2 value;
  Record() { memset(&value, 0, sizeof value); }
  ~Record() { vltutilsFreeComponent2(value); }
  Record(const Record&) = delete;
  Record& operator=(const Record&) = delete;
};

Component Describe(const _vltComponent2& r) {
  Component c;
  c.type = NameOf(r.type);
  c.name = NarrowText(r.name);
  c.guid = GuidText(r.identifier);
  c.file = NarrowText(r.fileName);
  c.fileIsExact = !r.fileName || wcstombs(nullptr, r.fileName, 0) != static_cast<size_t>(-1);
  c.recordVersion = r.version;
  if (r.type == vltComponentDataDictionary) {
    c.schemaVersion = r.dictionary.schemaVersion;
    c.fragmentRegistered = r.dictionary.fragmentRegistered;
    c.lastInstalledSchemaVersion = r.dictionary.lastInstalledSchemaVersion;
    c.prefix = NarrowText(r.dictionary.prefix);
  } else if (r.type == vltComponentResourceExpert) {
    c.pnp = NarrowText(r.resource.pnp);
  }
  return c;
}

}  // namespace

Client::Client() {
  auto start = std::chrono::steady_clock::now();
  HRESULT result = S_OK;
  try {
    result = vltGetRegistrar(&m_registrar);
  } catch (int) {
    // The library's word for a database that cannot be opened.
    throw Unusable("the registration database cannot be opened", "\"vltctl verify\" says why");
  }
  auto taken = std::chrono::steady_clock::now() - start;
  m_timeToReady = std::chrono::duration_cast<std::chrono::microseconds>(taken);
  if (result < 0 || !m_registrar) throw Unusable("the registrar cannot be had", "");
}

Client::~Client() { m_registrar->Release(); }

std::vector<Component> Client::list() const {
  std::vector<Component> components;
  for (const TypeName& row : kTypes) {
    IvltEnumComponent* raw = nullptr;
    if (m_registrar->EnumComponents(row.type, &raw) < 0) {
      throw Unusable("the components cannot be listed", "");
    }
    Held<IvltEnumComponent> enumerator(raw);
    for (;;) {
      Record record;
      unsigned fetched = 0;
      if (enumerator->Next(1, &record.value, &fetched) != S_OK) break;
      components.push_back(Describe(record.value));
    }
  }
  // The library's own dictionary is always among them, unless the database could not be opened.
  if (components.empty()) throw Unusable("the registration database was set aside", "try again");
  return components;
}

std::optional<Component> Client::find(const std::string& guid) const {
  Record record;
  if (m_registrar->GetComponent(ParseGuid(guid), &record.value) < 0) {
    memset(&record.value, 0, sizeof record.value);
    return std::nullopt;
  }
  return Describe(record.value);
}

std::vector<Component> Client::classes(const std::string& guid) const {
  void* raw = nullptr;
  if (m_registrar->QueryInterface(IID_IvltDynamicRegistrar, &raw) < 0) return {};
  Held<IvltDynamicRegistrar> dynamic(static_cast<IvltDynamicRegistrar*>(raw));
  std::vector<Component> components;
  for (auto type : {vltComponentObjectExpert, vltComponentResourceExpert}) {
    unsigned count = 0;
    GUID* found = nullptr;
    if (dynamic->GetComponentsForBindingClass(type, ParseGuid(guid), &count, &found) < 0) continue;
    Text<GUID> array(found, &vltFree);
    for (unsigned i = 0; i < count; ++i) {
      if (auto component = find(GuidText(found[i]))) components.push_back(*component);
    }
  }
  return components;
}

}  // namespace vltctl
