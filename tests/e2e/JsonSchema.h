#pragma once

// As much of JSON Schema (draft 2020-12) as tools/vltctl-1.schema.json uses.

#include <nlohmann/json.hpp>
#include <regex>
#include <string>
#include <utility>

namespace vlt::test {

class JsonSchema {
 public:
  explicit JsonSchema(nlohmann::json root) : m_root(std::move(root)) {}

  // Where and how the value is against the schema; empty if it is not.
  std::string against(const nlohmann::json& value) const { return check(m_root, value, ""); }

 private:
  using json = nlohmann::json;

  static bool isA(const std::string& type, const json& value) {
    if (type == "object") return value.is_object();
    if (type == "array") return value.is_array();
    if (type == "string") return value.is_string();
    if (type == "boolean") return value.is_boolean();
    if (type == "integer") return value.is_number_integer();
    if (type == "number") return value.is_number();
    return type == "null" && value.is_null();
  }

  static bool isOneOf(const json& types, const json& value) {
    if (types.is_string()) return isA(types, value);
    for (const json& type : types) {
      if (isA(type, value)) return true;
    }
    return false;
  }

  std::string checkObject(const json& schema, const json& value, const std::string& at) const {
    for (const json& name : schema.value("required", json::array())) {
      if (!value.contains(name)) return at + ": lacks " + name.dump();
    }
    json properties = schema.value("properties", json::object());
    bool mayHaveMore = schema.value("additionalProperties", true);
    for (const auto& [name, member] : value.items()) {
      if (!properties.contains(name)) {
        if (!mayHaveMore) return at + ": has \"" + name + "\"";
        continue;
      }
      std::string wrong = check(properties[name], member, at + "/" + name);
      if (!wrong.empty()) return wrong;
    }
    return "";
  }

  std::string checkRest(const json& schema, const json& value, const std::string& at) const {
    for (const json& part : schema.value("allOf", json::array())) {
      bool holds = !part.contains("if") || check(part["if"], value, at).empty();
      std::string wrong =
          holds ? check(part.contains("then") ? part["then"] : part, value, at) : "";
      if (!wrong.empty()) return wrong;
    }
    if (!value.is_array() || !schema.contains("items")) return "";
    for (size_t i = 0; i < value.size(); ++i) {
      std::string wrong = check(schema["items"], value[i], at + "/" + std::to_string(i));
      if (!wrong.empty()) return wrong;
    }
    return "";
  }

  std::string check(const json& schema, const json& value, const std::string& at) const {
    if (schema.contains("$ref")) {
      json::json_pointer target(schema["$ref"].get<std::string>().substr(1));
      return check(m_root.at(target), value, at);
    }
    if (schema.contains("type") && !isOneOf(schema["type"], value)) {
      return at + ": " + value.dump() + " is no " + schema["type"].dump();
    }
    if (schema.contains("const") && schema["const"] != value) return at + ": is " + value.dump();
    if (schema.contains("enum")) {
      bool found = false;
      for (const json& row : schema["enum"]) found = found || row == value;
      if (!found) return at + ": is " + value.dump();
    }
    if (schema.contains("pattern") && value.is_string() &&
        !std::regex_search(value.get<std::string>(), std::regex(schema["pattern"]))) {
      return at + ": " + value.dump() + " is not " + schema["pattern"].dump();
    }
    std::string wrong = value.is_object() ? checkObject(schema, value, at) : "";
    return wrong.empty() ? checkRest(schema, value, at) : wrong;
  }

  const json m_root;
};

}  // namespace vlt::test
