#include "zt/fnd/osdep/path.h"

#include <algorithm>
#include <cwchar>
#include <utility>
#include <vector>

#include "zt/fnd/Exception.h"
#include "zt/fnd/String.h"

// The operations on path text.
namespace zt::fnd::osdep {
namespace {

using size_type = String::size_type;

template <class S>
bool EndsInSlash(const S& text) {
  return !text.empty() && text[text.length() - 1] == '/';
}

template <class S>
S JoinText(const S& a, const S& b) {
  if (a.empty() || (!b.empty() && b[0] == '/')) return b;
  if (EndsInSlash(a)) return S(a, b);
  // Of slashes, of which one stays: one allocation.
  S joined(a.length() + 1 + b.length(), typename S::value_type('/'));
  std::copy(a.begin(), a.end(), joined.begin());
  std::copy(b.begin(), b.end(), joined.begin() + a.length() + 1);
  return joined;
}

// A component of a path, by place and length.
using Component = std::pair<size_type, size_type>;

// The components of a text that ends in "/", each without its "/".
std::vector<Component> Split(const String& text) {
  std::vector<Component> components;
  size_type begin = 0;
  for (size_type i = 0; i < text.length(); ++i) {
    if (text[i] != L'/') continue;
    components.emplace_back(begin, i - begin);
    begin = i + 1;
  }
  return components;
}

bool Equals(const String& text, const Component& component, const wchar_t* literal) {
  return wcslen(literal) == component.second &&
         wmemcmp(text.c_str() + component.first, literal, component.second) == 0;
}

// The components that ".." and "." leave, last first; false if the path has no normal form.
bool KeepComponents(const String& text, std::vector<Component>& kept) {
  // From the last to the first: a ".." removes what comes before it, which is not known to go until
  // the ".." has been seen.
  std::vector<Component> components = Split(text);
  size_type skip = 0;
  for (size_type i = static_cast<size_type>(components.size()); i-- > 0;) {
    const Component& component = components[i];
    if (Equals(text, component, L"...")) return false;
    if (Equals(text, component, L"..")) {
      ++skip;
    } else if (Equals(text, component, L".")) {
      continue;
    } else if (skip == 0) {
      kept.push_back(component);
    } else if (i == 0) {
      return false;  // above the root
    } else {
      --skip;
    }
  }
  return true;
}

}  // namespace

bool path::IsPathAbsolute(const wchar_t* path) { return path && path[0] == L'/'; }

bool path::IsAbs(const String& path) { return IsPathAbsolute(path.c_str()); }

String path::DirName(const String& path) {
  size_type root = path.find_first_not_of(String(L"/"));
  if (root == String::npos) return path;
  size_type slash = path.rfind(L'/');
  if (slash == String::npos || slash < root) return path.substr(0, root);
  // The run of slashes that ends there; a name is before it, as root lies after the leading
  // run.
  return path.substr(0, path.find_last_not_of(L'/', slash) + 1);
}

String path::BaseName(const String& path) {
  size_type slash = path.rfind(L'/');
  return slash == String::npos ? path : path.substr(slash + 1);
}

String path::Join(const String& a, const String& b) { return JoinText(a, b); }

AnsiString path::Join(const AnsiString& a, const AnsiString& b) { return JoinText(a, b); }

void path::MakePathEndInSlash(String& path) {
  if (path.empty()) ZT_RAISE(exception::InvalidArgument());
  if (!EndsInSlash(path)) path += L'/';
}

String path::NormalizePath(const String& path) {
  if (!IsAbs(path)) return String();
  // Most paths: nothing to take out, and no memory needed.
  if (path.find(L'.') == String::npos) return path;
  String text(path);
  bool appended = !EndsInSlash(text);
  if (appended) text += L'/';
  std::vector<Component> kept;
  if (!KeepComponents(text, kept)) return String();
  String result;
  result.reserve(text.length());
  for (size_type i = static_cast<size_type>(kept.size()); i-- > 0;) {
    result.append(text.c_str() + kept[i].first, kept[i].second);
    result += L'/';
  }
  return appended ? DirName(result) : result;
}

}  // namespace zt::fnd::osdep
