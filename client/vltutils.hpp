#pragma once

// The library for C++ programs: values that own what they hold, ranges in place of enumerators, exceptions
// in place of result codes. Header-only, C++17, over the exported surface (<vltutils/vltutils.h>).
//
//   for (const vlt::Component& c : vlt::registrar().components(vlt::ObjectExpert))
//     std::cout << c.name << "  " << c.file << "\n";
//
// Texts are UTF-8, in both directions and whatever the process's locale; what is no Unicode character
// becomes U+FFFD. File names are still read in the encoding of the locale: a program begins with
// setlocale(LC_ALL, ""), or components whose names are not ASCII are not found.
//
// Failures are vlt::Error, with the result in code(); out of memory is std::bad_alloc. The exceptions of
// the library itself pass through (<vltutils/Exception.h>). Threads: every function may be called from
// every thread; an object belongs to one at a time.
//
// A program that only looks at what is installed does better with <vltutils/snapshot.hpp>: the
// registrar keeps the database's lock for the life of its process, and waits for another that has it.

#include <vltutils/vltutils.h>
#include <vltutils/results.hpp>

#include <cstring>
#include <iterator>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>
#include <vector>

namespace vlt {

// ---- Results

// "E_FAIL (0x80004005): ..."; the number alone for a code that is not the library's.
inline std::string describe(HRESULT result) {
  static constexpr char kDigits[] = "0123456789ABCDEF";
  const auto code = static_cast<std::uint32_t>(result);
  std::string number = "0x";
  for (int shift = 28; shift >= 0; shift -= 4) number += kDigits[code >> shift & 15];
  const ResultInfo* row = FindResult(code);
  return row ? std::string(row->name) + " (" + number + "): " + row->meaning : number;
}

// Of the library's results.
inline const std::error_category& category() noexcept {
  struct Category final : std::error_category {
    const char* name() const noexcept override { return "vltutils"; }
    std::string message(int result) const override { return describe(result); }
  };
  static const Category category;
  return category;
}

// A call that failed. what() names the call and the result.
class Error : public std::system_error {
 public:
  Error(HRESULT result, const char* call) : std::system_error(result, category(), call) {}
  HRESULT result() const noexcept { return code().value(); }
};

// Throws for a failure; returns a success.
inline HRESULT check(HRESULT result, const char* call) {
  if (result == E_OUTOFMEMORY) throw std::bad_alloc();
  if (result < 0) throw Error(result, call);
  return result;
}

// ---- Texts

inline std::string toUtf8(std::wstring_view text) {
  std::string out;
  out.reserve(text.size());
  for (const wchar_t character : text) {
    auto c = static_cast<std::uint32_t>(character);
    if (c > 0x10FFFF || (c >= 0xD800 && c < 0xE000)) c = 0xFFFD;
    if (c < 0x80) {
      out += static_cast<char>(c);
      continue;
    }
    const int more = c < 0x800 ? 1 : c < 0x10000 ? 2 : 3;
    constexpr unsigned kLeads[] = {0, 0xC0, 0xE0, 0xF0};
    out += static_cast<char>(kLeads[more] | c >> 6 * more);
    for (int rest = more - 1; rest >= 0; --rest)
      out += static_cast<char>(0x80 | (c >> 6 * rest & 0x3F));
  }
  return out;
}

// Null counts as empty.
inline std::string toUtf8(const wchar_t* text) {
  return text ? toUtf8(std::wstring_view(text)) : std::string();
}

// Of bytes that are no UTF-8, each becomes U+FFFD.
inline std::wstring toWide(std::string_view text) {
  std::wstring out;
  out.reserve(text.size());
  const auto byte = [&](std::size_t at) { return static_cast<unsigned char>(text[at]); };
  for (std::size_t at = 0; at < text.size();) {
    const std::uint32_t lead = byte(at);
    const std::size_t length = lead < 0x80   ? 1
                               : lead < 0xC2 ? 0
                               : lead < 0xE0 ? 2
                               : lead < 0xF0 ? 3
                               : lead < 0xF5 ? 4
                                             : 0;
    std::uint32_t c = length < 2 ? lead : lead & (0x7Fu >> length);
    bool good = length > 0 && at + length <= text.size();
    for (std::size_t n = 1; good && n < length; ++n) {
      good = (byte(at + n) & 0xC0) == 0x80;
      c = c << 6 | (byte(at + n) & 0x3Fu);
    }
    constexpr std::uint32_t kLeast[] = {0, 0, 0x80, 0x800, 0x10000};
    good = good && c >= kLeast[length] && c <= 0x10FFFF && (c < 0xD800 || c >= 0xE000);
    out += good ? static_cast<wchar_t>(c) : L'\xFFFD';
    at += good ? length : 1;
  }
  return out;
}

namespace detail {

struct Free {
  void operator()(void* block) const noexcept { vltFree(block); }
};

// A text that a call gives, owned.
class TextOut {
 public:
  TextOut() = default;
  TextOut(const TextOut&) = delete;
  TextOut& operator=(const TextOut&) = delete;
  ~TextOut() { vltFree(m_text); }
  wchar_t** out() noexcept { return &m_text; }
  std::string str() const { return toUtf8(m_text); }

 private:
  wchar_t* m_text = nullptr;
};

// Where a shared file cannot be opened, calls throw the number 1.
template <class Call>
HRESULT guarded(const char* name, Call call) {
  try {
    return check(call(), name);
  } catch (int) {
    throw Error(E_FAIL, name);
  }
}

}  // namespace detail

// ---- Values

// A GUID (RFC 4122), as a value: comparable, and null at first.
class Guid {
 public:
  constexpr Guid() noexcept : m_value{} {}
  constexpr Guid(const GUID& value) noexcept : m_value(value) {}

  // The 36 characters, or 38 with braces, in any case; nothing for any other text.
  static std::optional<Guid> parse(std::string_view text) {
    if (text.size() == 38 && text.front() == '{' && text.back() == '}') text = text.substr(1, 36);
    if (text.size() != 36) return std::nullopt;
    std::uint64_t parts[2] = {0, 0};
    for (std::size_t at = 0, digits = 0; at < text.size(); ++at) {
      if (at == 8 || at == 13 || at == 18 || at == 23) {
        if (text[at] != '-') return std::nullopt;
        continue;
      }
      const int digit = digitOf(text[at]);
      if (digit < 0) return std::nullopt;
      parts[digits / 16] = parts[digits / 16] << 4 | static_cast<unsigned>(digit);
      ++digits;
    }
    GUID value;
    value.Data1 = static_cast<std::uint32_t>(parts[0] >> 32);
    value.Data2 = static_cast<std::uint16_t>(parts[0] >> 16);
    value.Data3 = static_cast<std::uint16_t>(parts[0]);
    for (int n = 0; n < 8; ++n) {
      value.Data4[n] = static_cast<unsigned char>(parts[1] >> 8 * (7 - n));
    }
    return Guid(value);
  }

  // "{00112233-4455-6677-8899-AABBCCDDEEFF}".
  std::string str() const {
    static constexpr char kDigits[] = "0123456789ABCDEF";
    std::string out = "{";
    const auto hex = [&](std::uint32_t number, int digits) {
      while (digits-- > 0) out += kDigits[number >> 4 * digits & 15];
    };
    hex(m_value.Data1, 8);
    out += '-';
    hex(m_value.Data2, 4);
    out += '-';
    hex(m_value.Data3, 4);
    out += '-';
    for (int n = 0; n < 8; ++n) {
      if (n == 2) out += '-';
      hex(m_value.Data4[n], 2);
    }
    return out + "}";
  }

  const GUID& value() const noexcept { return m_value; }
  bool isNull() const noexcept { return *this == Guid(); }

  friend bool operator==(const Guid& a, const Guid& b) noexcept {
    return std::memcmp(&a.m_value, &b.m_value, sizeof a.m_value) == 0;
  }
  friend bool operator!=(const Guid& a, const Guid& b) noexcept { return !(a == b); }
  // In the order of the text.
  friend bool operator<(const Guid& a, const Guid& b) noexcept {
    const GUID &l = a.m_value, &r = b.m_value;
    if (l.Data1 != r.Data1) return l.Data1 < r.Data1;
    if (l.Data2 != r.Data2) return l.Data2 < r.Data2;
    if (l.Data3 != r.Data3) return l.Data3 < r.Data3;
    return std::memcmp(l.Data4, r.Data4, sizeof l.Data4) < 0;
  }

 private:
  static constexpr int digitOf(char c) noexcept {
    return c >= '0' && c <= '9'   ? c - '0'
           : c >= 'a' && c <= 'f' ? c - 'a' + 10
           : c >= 'A' && c <= 'F' ? c - 'A' + 10
                                  : -1;
  }

  GUID m_value;
};

// One reference to an object of the library.
template <class T>
class Ref {
 public:
  Ref() noexcept = default;
  // Takes over the caller's reference.
  explicit Ref(T* object) noexcept : m_object(object) {}
  Ref(const Ref& other) noexcept : m_object(other.m_object) {
    if (m_object) m_object->AddRef();
  }
  Ref(Ref&& other) noexcept : m_object(std::exchange(other.m_object, nullptr)) {}
  Ref& operator=(Ref other) noexcept {
    std::swap(m_object, other.m_object);
    return *this;
  }
  ~Ref() {
    if (m_object) m_object->Release();
  }

  T* get() const noexcept { return m_object; }
  T* operator->() const noexcept { return m_object; }
  explicit operator bool() const noexcept { return m_object != nullptr; }

  // For a call that returns a reference; what was held is released.
  T** out() noexcept {
    *this = Ref();
    return &m_object;
  }
  // Another interface of the object; null where it has none.
  template <class Other>
  Ref<Other> as(const GUID& iid) const {
    void* other = nullptr;
    if (!m_object || m_object->QueryInterface(iid, &other) < 0) return Ref<Other>();
    return Ref<Other>(static_cast<Other*>(other));
  }

 private:
  T* m_object = nullptr;
};

// ---- Components

enum Type {
  Dictionary = vltComponentDataDictionary,
  ObjectExpert = vltComponentObjectExpert,
  ResourceExpert = vltComponentResourceExpert,
};

// What a data dictionary has besides.
struct DictionaryFacts {
  std::uint32_t schemaVersion = 0;
  // Merged since the last IvltPharlapRegistrarEx::ResetDDUpdatedFlags.
  bool isChanged = false;
  // None where no client has stored one.
  std::optional<std::uint32_t> lastInstalledSchemaVersion;
  std::string prefix;
};

struct Component {
  Type type = ObjectExpert;
  std::string name;
  Guid guid;
  std::string file;  // path of the bundle or library; empty if there is none
  std::optional<DictionaryFacts> dictionary;
  std::string pnp;  // of a resource expert
};

namespace detail {

// A record that a call fills.
class Record {
 public:
  Record() noexcept { std::memset(&m_record, 0, sizeof m_record); }
  Record(const Record&) = delete;
  Record& operator=(const Record&) = delete;
  ~Record() { clear(); }

  _vltComponent2* out() noexcept {
    clear();
    m_isFilled = true;
    return &m_record;
  }
  // After a call that has filled nothing.
  void forget() noexcept { m_isFilled = false; }

  Component value() const {
    Component out;
    out.type = static_cast<Type>(m_record.type);
    out.name = toUtf8(m_record.name);
    out.guid = m_record.identifier;
    out.file = toUtf8(m_record.fileName);
    if (m_record.type == vltComponentDataDictionary) {
      constexpr std::uint32_t kNone = 0xFFFFFFFF;
      const vltDictVariant& from = m_record.dictionary;
      DictionaryFacts facts;
      facts.schemaVersion = from.schemaVersion;
      facts.isChanged = from.fragmentRegistered != 0;
      if (from.lastInstalledSchemaVersion != kNone) {
        facts.lastInstalledSchemaVersion = from.lastInstalledSchemaVersion;
      }
      facts.prefix = toUtf8(from.prefix);
      out.dictionary = std::move(facts);
    } else if (m_record.type == vltComponentResourceExpert) {
      out.pnp = toUtf8(m_record.resource.pnp);
    }
    return out;
  }

 private:
  void clear() noexcept {
    if (m_isFilled) vltutilsFreeComponent2(m_record);
    m_isFilled = false;
    std::memset(&m_record, 0, sizeof m_record);
  }

  _vltComponent2 m_record;
  bool m_isFilled = false;
};

}  // namespace detail

// The components of one type as they were when the range was made: an input range, to be walked once.
class Components {
 public:
  explicit Components(Ref<IvltEnumComponent> walk) : m_walk(std::move(walk)) {}

  class iterator {
   public:
    using iterator_category = std::input_iterator_tag;
    using value_type = Component;
    using difference_type = std::ptrdiff_t;
    using pointer = const Component*;
    using reference = const Component&;

    iterator() = default;
    reference operator*() const noexcept { return m_component; }
    pointer operator->() const noexcept { return &m_component; }
    iterator& operator++() {
      detail::Record record;
      unsigned fetched = 0;
      const HRESULT result = m_walk->Next(1, record.out(), &fetched);
      if (fetched == 0) record.forget();
      check(result, "IvltEnumComponent::Next");
      if (fetched == 0) {
        m_walk = Ref<IvltEnumComponent>();
      } else {
        m_component = record.value();
      }
      return *this;
    }
    void operator++(int) { ++*this; }
    friend bool operator==(const iterator& a, const iterator& b) noexcept {
      return a.m_walk.get() == b.m_walk.get();
    }
    friend bool operator!=(const iterator& a, const iterator& b) noexcept { return !(a == b); }

   private:
    friend class Components;
    explicit iterator(Ref<IvltEnumComponent> walk) : m_walk(std::move(walk)) { ++*this; }

    Ref<IvltEnumComponent> m_walk;  // null at the end
    Component m_component;
  };

  iterator begin() const { return iterator(m_walk); }
  iterator end() const { return iterator(); }

 private:
  Ref<IvltEnumComponent> m_walk;
};

// The registrar of this process.
class Registrar {
 public:
  explicit Registrar(Ref<IvltRegistrar> object) : m_object(std::move(object)) {}

  Components components(Type type) const {
    Ref<IvltEnumComponent> walk;
    check(m_object->EnumComponents(static_cast<_vltComponentType>(type), walk.out()),
          "IvltRegistrar::EnumComponents");
    return Components(std::move(walk));
  }

  std::optional<Component> find(const Guid& guid) const {
    detail::Record record;
    const HRESULT result = m_object->GetComponent(guid.value(), record.out());
    if (result < 0) record.forget();
    if (result == E_INVALIDARG) return std::nullopt;
    check(result, "IvltRegistrar::GetComponent");
    return record.value();
  }

  // The experts of the type that bind to the class of objects; none is no failure.
  std::vector<Guid> boundTo(Type type, const Guid& bindingClass) const {
    const auto object = m_object.as<IvltDynamicRegistrar>(IID_IvltDynamicRegistrar);
    if (!object) throw Error(E_NOINTERFACE, "IvltDynamicRegistrar");
    unsigned count = 0;
    GUID* found = nullptr;
    const HRESULT result = object->GetComponentsForBindingClass(
        static_cast<_vltComponentType>(type), bindingClass.value(), &count, &found);
    const std::unique_ptr<GUID, detail::Free> owner(found);
    if (result == VLT_E_NO_COMPONENT) return {};
    check(result, "IvltDynamicRegistrar::GetComponentsForBindingClass");
    return std::vector<Guid>(found, found + count);
  }

  std::string configurationPath() const {
    detail::TextOut path;
    check(m_object->GetConfigurationPath(path.out()), "IvltRegistrar::GetConfigurationPath");
    return path.str();
  }

  IvltRegistrar* get() const noexcept { return m_object.get(); }

 private:
  Ref<IvltRegistrar> m_object;
};

// The first call scans what is installed and brings the database up to date; it waits, without limit,
// while another process has the database. Later calls answer at once.
inline Registrar registrar() {
  Ref<IvltRegistrar> object;
  detail::guarded("vltGetRegistrar", [&] { return vltGetRegistrar(object.out()); });
  return Registrar(std::move(object));
}

// Loads the component's files as a client would, and says what is wrong with them; nothing for a sound
// one. The null GUID is all components.
inline std::vector<std::string> problemsOf(const Guid& guid) {
  Ref<IEnumString> walk;
  HRESULT result = S_OK;
  try {
    result = vltCheckComponent(guid.value(), walk.out());
  } catch (int) {
    throw Error(E_FAIL, "vltCheckComponent");
  }
  if (!walk) check(result, "vltCheckComponent");
  std::vector<std::string> out;
  wchar_t* text = nullptr;
  unsigned fetched = 0;
  while (walk && walk->Next(1, &text, &fetched) == S_OK) {
    const std::unique_ptr<wchar_t, detail::Free> owner(text);
    out.push_back(toUtf8(text));
  }
  if (out.empty()) check(result, "vltCheckComponent");
  return out;
}

// ---- Settings and rendezvous

// How a client reaches a server.
struct Endpoints {
  std::string bootstrap, protocol, endpoint, eventNameAppend;
};

// Of the server of this machine. `index` is the number after the names of the settings; 3 has defaults.
inline Endpoints localEndpoints(unsigned index = 3) {
  detail::TextOut bootstrap, protocol, endpoint, append;
  detail::guarded("vltGetClientSettings", [&] {
    return vltGetClientSettings(index, 0, 0, nullptr, bootstrap.out(), protocol.out(),
                                endpoint.out(), nullptr, append.out());
  });
  return {bootstrap.str(), protocol.str(), endpoint.str(), append.str()};
}

// Sizes of a client's caches: counts, bytes, per cent, milliseconds.
struct CacheSettings {
  unsigned objects = 0, objectFlushPercentage = 0;
  unsigned bufferBytes = 0, bufferMinimumBytes = 0, bufferFlushPercentage = 0;
  unsigned garbageCollectorMilliseconds = 0;
};

inline CacheSettings cacheSettings() {
  CacheSettings out;
  detail::guarded("vltGetClientCacheSettings", [&] {
    return vltGetClientCacheSettings(&out.objects, &out.objectFlushPercentage, &out.bufferBytes,
                                     &out.bufferMinimumBytes, &out.bufferFlushPercentage,
                                     &out.garbageCollectorMilliseconds, 0, nullptr);
  });
  return out;
}

// Of this machine's server; made, and kept, at the first call on the machine.
inline Guid serverIdentity() {
  GUID identity{};
  detail::guarded("vltGetServerIdentity", [&] { return vltGetServerIdentity(&identity); });
  return identity;
}

// "127.0.0.1:port".
inline std::string localConfigurationUrl() {
  detail::TextOut url;
  detail::guarded("vltGetLocalConfigurationURL",
                  [&] { return vltGetLocalConfigurationURL(url.out()); });
  return url.str();
}

}  // namespace vlt
