#pragma once

// Names of the string template and its four instances, for headers that only pass strings by
// reference or return them. The template itself is the library's own and is not installed.

namespace zt::fnd {

// T is the character, Other the character it converts from and to. The third argument selects the
// encoding of an 8-bit string: wchar_t the process locale, char US-ASCII. A string of unsigned char
// is UTF-8.
template <class T, class Other, class Encoding>
class StringBase;

using String = StringBase<wchar_t, char, wchar_t>;               // 32-bit code points
using AnsiString = StringBase<char, wchar_t, wchar_t>;           // the process locale
using AsciiString = StringBase<char, wchar_t, char>;             // US-ASCII
using Utf8String = StringBase<unsigned char, wchar_t, wchar_t>;  // UTF-8

}  // namespace zt::fnd
