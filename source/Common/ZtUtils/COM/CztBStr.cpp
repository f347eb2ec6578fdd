#include "source/Common/ZtUtils/COM/CztBStr.h"

#include <cwchar>
#include <utility>

#include "ztcom/ztcore/ztmemmgr.h"

CztBStr::CztBStr(wchar_t* text, bool take) : m_text(take ? text : ZtSysAllocString(text)) {}
CztBStr::CztBStr(const CztBStr& other) : m_text(ZtSysAllocString(other.m_text)) {}
CztBStr::CztBStr(const zt::fnd::String& text) : m_text(ZtSysAllocString(text.c_str())) {}

CztBStr::CztBStr(const char* text) {
  if (text) m_text = ZtSysAllocString(zt::fnd::String(text).c_str());
}

CztBStr::~CztBStr() { ZtSysFreeString(m_text); }

CztBStr& CztBStr::operator=(const CztBStr& other) {
  CztBStr copy(other);
  swap(copy);
  return *this;
}

CztBStr& CztBStr::operator=(const zt::fnd::String& text) {
  // Freed first, unlike in the other assignments: without memory the result is a null text, and not
  // the old one.
  clear();
  m_text = ZtSysAllocString(text.c_str());
  return *this;
}

CztBStr& CztBStr::operator=(const char* text) {
  if (!text) return *this;
  CztBStr copy(text);
  swap(copy);
  return *this;
}

void CztBStr::clear() {
  ZtSysFreeString(m_text);
  m_text = nullptr;
}

void CztBStr::swap(CztBStr& other) noexcept { std::swap(m_text, other.m_text); }

zt::fnd::String CztBStr::ToFNDString() const { return zt::fnd::String(m_text ? m_text : L""); }

zt::fnd::AnsiString CztBStr::ToFNDAnsiString() const {
  return zt::fnd::AnsiString(m_text ? m_text : L"");
}

bool CztBStr::operator<(const CztBStr& other) const {
  // Not an order for containers: a null text is equivalent to every other.
  return m_text && other.m_text && wcscmp(m_text, other.m_text) < 0;
}
