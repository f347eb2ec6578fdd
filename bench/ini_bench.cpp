// The INI engine beside the bare way of doing the same: fread of the file, look-up in an
// std::unordered_map, fwrite of the text. The argument is the number of sections, of 10 items each.
#include <benchmark/benchmark.h>
#include <stdlib.h>

#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <memory>
#include <string>
#include <system_error>
#include <unordered_map>
#include <vector>

#include "ztini/ztini.h"

namespace {

constexpr int kItems = 10;
constexpr int kLookups = 100000;

std::string SectionName(int64_t section) { return "Component " + std::to_string(section); }
std::string ItemName(int64_t item) { return "Attribute" + std::to_string(item); }

std::string MakeText(int64_t sections) {
  std::string text;
  for (int64_t s = 0; s < sections; ++s) {
    text += "[" + SectionName(s) + "]\n";
    for (int i = 0; i < kItems; ++i) {
      text += ItemName(i) + " = \"value " + std::to_string(s * kItems + i) + "\"\n";
    }
  }
  return text;
}

// A directory with one file a size, gone when the program ends.
class Files {
 public:
  Files() {
    std::string name = (std::filesystem::temp_directory_path() / "ini_bench.XXXXXX").string();
    if (!mkdtemp(name.data())) abort();
    m_directory = name;
  }
  ~Files() {
    std::error_code ignored;  // what cannot be removed lies in the temporary directory anyway
    std::filesystem::remove_all(m_directory, ignored);
  }
  std::string path(int64_t sections) {
    const std::string path = m_directory + "/" + std::to_string(sections) + ".ini";
    if (!std::filesystem::exists(path)) write(path, MakeText(sections));
    return path;
  }
  std::string other() const { return m_directory + "/other.ini"; }
  static void write(const std::string& path, const std::string& text) {
    FILE* file = fopen(path.c_str(), "wb");
    if (!file || fwrite(text.data(), 1, text.size(), file) != text.size()) abort();
    fclose(file);
  }

 private:
  std::string m_directory;
};

Files& TheFiles() {
  static Files files;
  return files;
}

struct Dispose {
  void operator()(IniStructForwardReferenceTag* doc) const { IniDispose(doc); }
};
using Document = std::unique_ptr<IniStructForwardReferenceTag, Dispose>;

// With the options that the guarded files of the system use.
Document ReadDocument(int64_t sections) {
  Document doc(IniNew(0));
  IniSetReadOptions(doc.get(), 22);
  IniSetWriteOptions(doc.get(), -1, 32, 26);
  if (IniReadFromFile(doc.get(), TheFiles().path(sections).c_str()) != 0) abort();
  return doc;
}

// The same questions for both ways, in an order that is no order.
struct Question {
  std::string section, item;
};
std::vector<Question> Questions(int64_t sections) {
  std::vector<Question> questions;
  uint64_t random = 1;
  for (int i = 0; i < kLookups; ++i) {
    random = random * 6364136223846793005u + 1442695040888963407u;
    const auto section = static_cast<int64_t>((random >> 33) % static_cast<uint64_t>(sections));
    questions.push_back(
        {SectionName(section), ItemName(static_cast<int64_t>(random >> 60) % kItems)});
  }
  return questions;
}

void SetBytes(benchmark::State& state) {
  const auto bytes = std::filesystem::file_size(TheFiles().path(state.range(0)));
  state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(bytes));
}

void Parse(benchmark::State& state) {
  const std::string path = TheFiles().path(state.range(0));
  for (auto _ : state) {
    Document doc(IniNew(0));
    IniSetReadOptions(doc.get(), 22);
    benchmark::DoNotOptimize(IniReadFromFile(doc.get(), path.c_str()));
    state.PauseTiming();
    doc.reset();
    state.ResumeTiming();
  }
  SetBytes(state);
}

void BareRead(benchmark::State& state) {
  const std::string path = TheFiles().path(state.range(0));
  std::string text(std::filesystem::file_size(path), 0);
  for (auto _ : state) {
    FILE* file = fopen(path.c_str(), "rb");
    benchmark::DoNotOptimize(fread(text.data(), 1, text.size(), file));
    fclose(file);
  }
  SetBytes(state);
}

void LookUp(benchmark::State& state) {
  Document doc = ReadDocument(state.range(0));
  const auto questions = Questions(state.range(0));
  for (auto _ : state) {
    for (const Question& question : questions) {
      const char* value = nullptr;
      if (IniGetPointerToRawString(doc.get(), question.section.c_str(), question.item.c_str(),
                                   &value) != 1) {
        state.SkipWithError("absent");
        return;
      }
      benchmark::DoNotOptimize(value);
    }
  }
  state.SetItemsProcessed(state.iterations() * kLookups);
}

void BareLookUp(benchmark::State& state) {
  std::unordered_map<std::string, std::unordered_map<std::string, std::string>> map;
  for (int64_t s = 0; s < state.range(0); ++s) {
    for (int i = 0; i < kItems; ++i) map[SectionName(s)][ItemName(i)] = "value";
  }
  const auto questions = Questions(state.range(0));
  for (auto _ : state) {
    for (const Question& question : questions) {
      benchmark::DoNotOptimize(
          map.find(question.section)->second.find(question.item)->second.data());
    }
  }
  state.SetItemsProcessed(state.iterations() * kLookups);
}

void ChangeAndSave(benchmark::State& state) {
  Document doc = ReadDocument(state.range(0));
  const std::string path = TheFiles().other();
  const std::string section = SectionName(state.range(0) / 2);
  int64_t value = 0;
  for (auto _ : state) {
    IniPutStringWithOptions(doc.get(), section.c_str(), "Attribute3",
                            std::to_string(++value).c_str(), 1, 1);
    if (IniWriteToFile(doc.get(), path.c_str()) != 0) state.SkipWithError("not saved");
  }
  SetBytes(state);
}

void Write(benchmark::State& state) {
  Document doc = ReadDocument(state.range(0));
  IniSetWriteOptions(doc.get(), -1, 32, 24);
  const std::string path = TheFiles().other();
  for (auto _ : state) {
    if (IniWriteToFile(doc.get(), path.c_str()) != 0) state.SkipWithError("not written");
  }
  SetBytes(state);
}

void BareWrite(benchmark::State& state) {
  const std::string text = MakeText(state.range(0));
  for (auto _ : state) Files::write(TheFiles().other(), text);
  SetBytes(state);
}

void PutAll(benchmark::State& state) {
  for (auto _ : state) {
    Document doc(IniNew(0));
    for (int64_t s = 0; s < state.range(0); ++s) {
      const std::string section = SectionName(s);
      for (int i = 0; i < kItems; ++i) {
        IniPut(doc.get(), section.c_str(), ItemName(i).c_str(), "value", 34);
      }
    }
    state.PauseTiming();
    doc.reset();
    state.ResumeTiming();
  }
  state.SetItemsProcessed(state.iterations() * state.range(0) * kItems);
}

#define INI_SIZES RangeMultiplier(10)->Range(100, 100000)->Unit(benchmark::kMillisecond)
BENCHMARK(Parse)->INI_SIZES;
BENCHMARK(BareRead)->INI_SIZES;
BENCHMARK(LookUp)->INI_SIZES;
BENCHMARK(BareLookUp)->INI_SIZES;
BENCHMARK(ChangeAndSave)->INI_SIZES;
BENCHMARK(Write)->INI_SIZES;
BENCHMARK(BareWrite)->INI_SIZES;
BENCHMARK(PutAll)->INI_SIZES;

}  // namespace

BENCHMARK_MAIN();
