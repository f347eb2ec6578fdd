#pragma once

#include "zt/fnd/String.h"

// Where things lie in an installation: the one map of its names.
//
//   <install>/vlt.vlr                     the registration database
//   <install>/VLTHooks.ini                fault injection
//   <install>/Data/                       the jar, the settings, the log's limits
//   <install>/Data Dictionaries/*         dictionaries; Last/ keeps the previous ones
//   <install>/Experts/*                   object and resource experts
//
// The install directory is GetCurrentVltPath() (vlloader.h). The log alone looks in the default
// one, as it begins before that is known.
namespace vlt::layout {

inline constexpr const wchar_t* kDatabase = L"vlt.vlr";
inline constexpr const wchar_t* kHookFile = L"VLTHooks.ini";
inline constexpr const wchar_t* kData = L"Data";
inline constexpr const wchar_t* kConfiguration = L"config3.vlt";  // in kData
inline constexpr const wchar_t* kJar = L"vltjar.ini";             // in kData
inline constexpr const wchar_t* kSettings = L"kor.ini";           // in kData
inline constexpr const wchar_t* kDiagnostics = L"vldiag.ini";     // in kData
inline constexpr const wchar_t* kDictionaries = L"Data Dictionaries";
inline constexpr const wchar_t* kPreviousDictionaries = L"Last";  // in kDictionaries
inline constexpr const wchar_t* kExperts = L"Experts";

// The install directory with a slash at its end; empty if there is none.
zt::fnd::String InstallRoot();

// Path of a file in a directory, with one slash between them.
// Throws zt::fnd::exception::InvalidArgument for an empty directory.
zt::fnd::String FileIn(const zt::fnd::String& directory, const wchar_t* name);

// The same for a directory, which then ends in a slash.
zt::fnd::String DirectoryIn(const zt::fnd::String& directory, const wchar_t* name);

}  // namespace vlt::layout
