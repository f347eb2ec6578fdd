// Foundation text against the standard library's or POSIX's way of doing the same, in one run.
//
// Each pair has the same name before the slash: "Append/String" and "Append/std". What counts is the
// ratio inside a pair; the figures of one run do not compare with those of another.

#include <benchmark/benchmark.h>

#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <cwchar>
#include <string>
#include <vector>

#include "zt/fnd/Guid.h"
#include "zt/fnd/String.h"
#include "zt/fnd/Utf8ToWide.h"
#include "zt/fnd/WideToUtf8.h"

namespace {

using zt::fnd::AnsiString;
using zt::fnd::Guid;
using zt::fnd::String;

const std::wstring kWideAscii(
    L"/Library/Frameworks/Example Dictionary.framework/Resources/Info.vlr");
const std::string kAscii("/Library/Frameworks/Example Dictionary.framework/Resources/Info.vlr");
const char kGuidText[] = "{00112233-4455-6677-8899-AABBCCDDEEFF}";

// Half ASCII, half of two to four bytes.
std::wstring MixedText() {
  std::wstring text;
  for (int i = 0; i < 64; ++i) text += L"path \xE9\x20AC\x1F600";
  return text;
}

std::string MixedUtf8() {
  const std::wstring wide = MixedText();
  std::vector<unsigned char> bytes(zt::fnd::GetUtf8EncodingBytes(wide.c_str()));
  zt::fnd::WideToUtf8(wide.data(), wide.data() + wide.size(), bytes.data(),
                      bytes.data() + bytes.size());
  return std::string(bytes.begin(), bytes.end());
}

// ---- append one character at a time

void AppendString(benchmark::State& state) {
  for (auto _ : state) {
    String s;
    for (std::int64_t i = 0; i < state.range(0); ++i) s += L'x';
    benchmark::DoNotOptimize(s.c_str());
  }
}
BENCHMARK(AppendString)->Name("Append/String")->Arg(64)->Arg(4096);

void AppendStd(benchmark::State& state) {
  for (auto _ : state) {
    std::wstring s;
    for (std::int64_t i = 0; i < state.range(0); ++i) s += L'x';
    benchmark::DoNotOptimize(s.c_str());
  }
}
BENCHMARK(AppendStd)->Name("Append/std::wstring")->Arg(64)->Arg(4096);

// ---- copy

void CopyString(benchmark::State& state) {
  const String source(static_cast<unsigned>(state.range(0)), L'x');
  for (auto _ : state) {
    const String copy(source);
    benchmark::DoNotOptimize(copy.c_str());
  }
}
BENCHMARK(CopyString)->Name("Copy/String")->Arg(64)->Arg(4096);

void CopyStd(benchmark::State& state) {
  const std::wstring source(static_cast<std::size_t>(state.range(0)), L'x');
  for (auto _ : state) {
    const std::wstring copy(source);
    benchmark::DoNotOptimize(copy.c_str());
  }
}
BENCHMARK(CopyStd)->Name("Copy/std::wstring")->Arg(64)->Arg(4096);

// ---- case-insensitive compare of equal texts; the argument says whether their case differs

std::wstring OtherCase(bool differs) {
  std::wstring text = kWideAscii;
  for (wchar_t& c : text) {
    if (differs && c >= L'a' && c <= L'z') c = static_cast<wchar_t>(c - L'a' + L'A');
  }
  return text;
}

void CompareString(benchmark::State& state) {
  const String a(kWideAscii.c_str()), b(OtherCase(state.range(0) != 0).c_str());
  for (auto _ : state) benchmark::DoNotOptimize(a.compare(b));
}
BENCHMARK(CompareString)->Name("CaseCompare/String")->Arg(0)->Arg(1);

void CompareStd(benchmark::State& state) {
  const std::wstring a(kWideAscii), b(OtherCase(state.range(0) != 0));
  for (auto _ : state) benchmark::DoNotOptimize(wcscasecmp(a.c_str(), b.c_str()));
}
BENCHMARK(CompareStd)->Name("CaseCompare/wcscasecmp")->Arg(0)->Arg(1);

// ---- UTF-8, both ways; the argument is 0 for ASCII and 1 for mixed text

void DecodeFoundation(benchmark::State& state) {
  const std::string text = state.range(0) == 0 ? kAscii : MixedUtf8();
  const auto* const begin = reinterpret_cast<const unsigned char*>(text.data());
  std::vector<wchar_t> out(text.size());
  for (auto _ : state) {
    benchmark::DoNotOptimize(
        zt::fnd::Utf8ToWide(begin, begin + text.size(), out.data(), out.data() + out.size()));
  }
  state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(text.size()));
}
BENCHMARK(DecodeFoundation)->Name("Utf8Decode/Utf8ToWide")->Arg(0)->Arg(1);

void DecodePosix(benchmark::State& state) {
  const std::string text = state.range(0) == 0 ? kAscii : MixedUtf8();
  std::vector<wchar_t> out(text.size() + 1);
  for (auto _ : state) {
    benchmark::DoNotOptimize(std::mbstowcs(out.data(), text.c_str(), out.size()));
  }
  state.SetBytesProcessed(state.iterations() * static_cast<std::int64_t>(text.size()));
}
BENCHMARK(DecodePosix)->Name("Utf8Decode/mbstowcs")->Arg(0)->Arg(1);

void EncodeFoundation(benchmark::State& state) {
  const std::wstring text = state.range(0) == 0 ? kWideAscii : MixedText();
  std::vector<unsigned char> out(text.size() * 4);
  for (auto _ : state) {
    benchmark::DoNotOptimize(zt::fnd::WideToUtf8(text.data(), text.data() + text.size(), out.data(),
                                                 out.data() + out.size()));
  }
  state.SetItemsProcessed(state.iterations() * static_cast<std::int64_t>(text.size()));
}
BENCHMARK(EncodeFoundation)->Name("Utf8Encode/WideToUtf8")->Arg(0)->Arg(1);

void EncodePosix(benchmark::State& state) {
  const std::wstring text = state.range(0) == 0 ? kWideAscii : MixedText();
  std::vector<char> out(text.size() * 4 + 1);
  for (auto _ : state) {
    benchmark::DoNotOptimize(std::wcstombs(out.data(), text.c_str(), out.size()));
  }
  state.SetItemsProcessed(state.iterations() * static_cast<std::int64_t>(text.size()));
}
BENCHMARK(EncodePosix)->Name("Utf8Encode/wcstombs")->Arg(0)->Arg(1);

// ---- narrow and wide strings of ASCII text

void WidenString(benchmark::State& state) {
  for (auto _ : state) {
    const String s(kAscii.c_str());
    benchmark::DoNotOptimize(s.c_str());
  }
}
BENCHMARK(WidenString)->Name("Widen/String");

void WidenPosix(benchmark::State& state) {
  for (auto _ : state) {
    std::wstring s(kAscii.size(), L'\0');
    s.resize(std::mbstowcs(s.data(), kAscii.c_str(), s.size() + 1));
    benchmark::DoNotOptimize(s.c_str());
  }
}
BENCHMARK(WidenPosix)->Name("Widen/mbstowcs");

void NarrowString(benchmark::State& state) {
  for (auto _ : state) {
    const AnsiString s(kWideAscii.c_str());
    benchmark::DoNotOptimize(s.c_str());
  }
}
BENCHMARK(NarrowString)->Name("Narrow/AnsiString");

void NarrowPosix(benchmark::State& state) {
  for (auto _ : state) {
    std::string s(kWideAscii.size() * 4, '\0');
    s.resize(std::wcstombs(s.data(), kWideAscii.c_str(), s.size() + 1));
    benchmark::DoNotOptimize(s.c_str());
  }
}
BENCHMARK(NarrowPosix)->Name("Narrow/wcstombs");

// ---- GUIDs

void ParseGuid(benchmark::State& state) {
  const String text(kGuidText);
  Guid guid;
  for (auto _ : state) {
    guid.fromString(text);
    benchmark::DoNotOptimize(guid);
  }
}
BENCHMARK(ParseGuid)->Name("GuidParse/Guid");

void ParseScanf(benchmark::State& state) {
  for (auto _ : state) {
    unsigned d1, d[10];
    benchmark::DoNotOptimize(std::sscanf(kGuidText, "{%8x-%4x-%4x-%2x%2x-%2x%2x%2x%2x%2x%2x}", &d1,
                                         &d[0], &d[1], &d[2], &d[3], &d[4], &d[5], &d[6], &d[7],
                                         &d[8], &d[9]));
    benchmark::DoNotOptimize(d);
  }
}
BENCHMARK(ParseScanf)->Name("GuidParse/sscanf");

void PrintGuid(benchmark::State& state) {
  const Guid guid{String(kGuidText)};
  String text;
  for (auto _ : state) {
    guid.toString(text);
    benchmark::DoNotOptimize(text.c_str());
  }
}
BENCHMARK(PrintGuid)->Name("GuidPrint/Guid");

void PrintPrintf(benchmark::State& state) {
  const _GUID g = Guid(String(kGuidText)).get();
  char text[39];
  for (auto _ : state) {
    std::snprintf(text, sizeof text, "{%08X-%04X-%04X-%02X%02X-%02X%02X%02X%02X%02X%02X}", g.Data1,
                  g.Data2, g.Data3, g.Data4[0], g.Data4[1], g.Data4[2], g.Data4[3], g.Data4[4],
                  g.Data4[5], g.Data4[6], g.Data4[7]);
    benchmark::DoNotOptimize(text);
  }
}
BENCHMARK(PrintPrintf)->Name("GuidPrint/snprintf");

}  // namespace

int main(int argc, char** argv) {
  if (std::setlocale(LC_CTYPE, "C.UTF-8") == nullptr) {
    std::fputs("no locale C.UTF-8\n", stderr);
    return 2;
  }
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 2;
  benchmark::RunSpecifiedBenchmarks();
  benchmark::Shutdown();
  return 0;
}
