#pragma once

#include <string>

// What several contests are put together from.
namespace peers {

// A directory of this run, where the library keeps its shared objects and its installation, too.
// Below $TMPDIR, gone at the end.
const std::string& Place();

std::string ReadFile(const std::string& path);
// Writes aside and renames: the least that a safe save does.
void Replace(const std::string& path, const std::string& text);
std::string Md5(const std::string& text);
// Overwrites the 16 bytes of a sidecar.
void WriteSidecar(const std::string& path, const std::string& digest);
// An INI text of that many sections of 10 items.
std::string IniText(int sections);

// The contests of one field each; the rows of the whole.
void RunIni();
void RunFoundation();
void RunSystem();
void RunRegistrar();

}  // namespace peers
