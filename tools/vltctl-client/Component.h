#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "source/Utilities/vltutils.h"
#include "tools/common/Output.h"

// What vltctl knows of the registrar: components as plain values.
namespace vltctl {

struct Component {
  std::string type, name, guid, file;
  bool fileIsExact = true;  // no character of `file` is a replacement
  uint32_t recordVersion = 0;
  // Dictionaries only.
  std::optional<uint32_t> schemaVersion, fragmentRegistered, lastInstalledSchemaVersion;
  std::optional<std::string> prefix;
  std::optional<std::string> pnp;  // resource experts only
};

class Client {
 public:
  // Throws Failure.
  Client();
  ~Client();
  Client(const Client&) = delete;
  Client& operator=(const Client&) = delete;

  // All components: dictionaries, object experts, resource experts, UI providers; each in GUID order.
  std::vector<Component> list() const;
  std::optional<Component> find(const std::string& guid) const;
  // Components that bind to the class.
  std::vector<Component> classes(const std::string& guid) const;
  std::chrono::microseconds timeToReady() const { return m_timeToReady; }

 private:
  IvltRegistrar* m_registrar = nullptr;
  std::chrono::microseconds m_timeToReady{};
};

// In the process's locale; null is empty.
std::string NarrowText(const wchar_t* text);
std::string GuidText(GUID guid);
GUID ParseGuid(const std::string& text);

}  // namespace vltctl
