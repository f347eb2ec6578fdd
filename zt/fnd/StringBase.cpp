#include "zt/fnd/StringBase.inl"

#include "zt/fnd/StringSearch.inl"
#include "zt/fnd/StringWire.inl"

namespace zt::fnd {

template class StringBase<wchar_t, char, wchar_t>;
template class StringBase<char, wchar_t, wchar_t>;
template class StringBase<char, wchar_t, char>;
template class StringBase<unsigned char, wchar_t, wchar_t>;

// Called by the tagged constructors, which are templates and no part of the classes' instantiation.
template void Utf8String::convertFrom(const String&);
template void String::convertFrom(const Utf8String&);
template void AsciiString::convertFrom(const String&);
template void String::convertFrom(const AsciiString&);
template void Utf8String::convertFrom(const AsciiString&);

}  // namespace zt::fnd
