#pragma once

#include "zt/fnd/String.h"

// Owner of one system string, the length-counted wide text that crosses interfaces.
//
// A null text is a state of its own: it converts to an empty String and is neither less nor greater
// than anything.
class CztBStr {
 public:
  CztBStr() = default;
  // Takes the system string itself, or copies the text; null stays null.
  CztBStr(wchar_t* text, bool take);
  CztBStr(const CztBStr& other);
  CztBStr(const zt::fnd::String& text);
  CztBStr(const char* text);  // in the process's locale
  ~CztBStr();

  CztBStr& operator=(const CztBStr& other);
  // Frees the old text first.
  CztBStr& operator=(const zt::fnd::String& text);
  // A null keeps the old text.
  CztBStr& operator=(const char* text);

  void clear();
  void swap(CztBStr& other) noexcept;
  wchar_t* get() const { return m_text; }

  operator zt::fnd::String() const { return ToFNDString(); }
  zt::fnd::String ToFNDString() const;
  zt::fnd::AnsiString ToFNDAnsiString() const;

  // By wcscmp; false with a null on either side.
  bool operator<(const CztBStr& other) const;

 private:
  wchar_t* m_text = nullptr;
};
