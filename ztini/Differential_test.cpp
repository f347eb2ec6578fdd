// Random documents under random edits give the results that the engine always gave.
//
// The digests were recorded with records, names and values in a malloc block each and with an index
// of pointers. They cover every status, text, position and line that callers see, so any change of
// the representation that shows outside changes one of them.
#include <gtest/gtest.h>

#include <array>
#include <cstdint>
#include <string>
#include <string_view>
#include <tuple>

#include "tests/support/TestDocument.h"

namespace {

using ztini::test::Document;
using ztini::test::NewDocument;

constexpr int kDocumentsPerGroup = 400;

// Line by line from a function, or as a whole, whose text the document then keeps.
enum class Source { Lines, Bytes };

class Random {
 public:
  explicit Random(uint64_t seed) : m_state(seed * 2654435761u + 1) {}
  int32_t below(int32_t limit) {
    m_state = m_state * 6364136223846793005u + 1442695040888963407u;
    return static_cast<int32_t>((m_state >> 33) % static_cast<uint32_t>(limit));
  }
  bool oneIn(int32_t number) { return below(number) == 0; }

 private:
  uint64_t m_state;
};

// FNV-1a over everything that was seen.
class Digest {
 public:
  void add(std::string_view text) {
    for (char c : text) addByte(static_cast<unsigned char>(c));
    addByte(0);
  }
  void add(const char* text) { add(text ? std::string_view(text) : std::string_view("<null>")); }
  void add(int64_t number) { add(std::to_string(number)); }
  uint64_t value() const { return m_value; }

 private:
  void addByte(unsigned char byte) { m_value = (m_value ^ byte) * 1099511628211u; }

  uint64_t m_value = 14695981039346656037u;
};

// One document, the names it is made of, and everything that may be done to it.
class Play {
 public:
  Play(uint64_t seed, Source source, Digest* digest)
      : m_random(seed),
        m_source(source),
        m_digest(digest),
        m_doc(NewDocument()),
        m_names(1 + m_random.below(80)) {}

  void run();

 private:
  void read();
  void edit();
  void put();
  void remove();
  void lookUp();
  void values();
  void enumerate();
  void showAll();
  void write();
  std::string fileText();
  std::string line();
  std::string name(const char* prefix);
  std::string text();
  void see(int32_t status, const char* out) {
    m_digest->add(status);
    m_digest->add(out);
  }

  Random m_random;
  Source m_source;
  Digest* m_digest;
  Document m_doc;
  int32_t m_names;  // the smaller, the more repeats
};

std::string Play::name(const char* prefix) {
  std::string made = prefix + std::to_string(m_random.below(m_names));
  if (m_random.oneIn(4)) made[0] = static_cast<char>(made[0] - 'a' + 'A');
  if (m_random.oneIn(8)) made = " \t" + made;
  if (m_random.oneIn(8)) made += "  ";
  if (m_random.oneIn(30)) made += "\xC4\xE4";
  if (m_random.oneIn(12)) made += " Line" + std::to_string(1 + m_random.below(3));
  return made;
}

std::string Play::text() {
  static constexpr const char* kTexts[] = {
      "",     "1",     "\"q\"",      "'q'",   "\"\"",     "  spaced  ", "\" in \"", "a\\tb\\x41\\",
      "True", "false", "4294967295", "1.5e3", "\xE4\xC4", "a=b:c",      "-Inf",     "x]y"};
  if (m_random.oneIn(20)) return std::string(static_cast<size_t>(m_random.below(3000)), 'v');
  return kTexts[m_random.below(static_cast<int32_t>(std::size(kTexts)))];
}

// Random numbers are drawn in statements of their own wherever an expression would leave their order
// to the compiler.
std::string Play::line() {
  const int32_t kind = m_random.below(20);
  const bool other = m_random.oneIn(3);
  std::string made = kind < 3 ? std::string() : name(kind < 6 ? "s" : "i");
  if (kind == 2) return other ? "[]" : "[open";
  if (kind >= 3 && kind < 6) return "[" + made + "]" + (other ? " rest" : "");
  if (kind == 0) made += "; ";
  if (kind == 6) made += other ? ":" : " := ";
  if (kind > 6) made += other ? " = " : "=";
  return made += text();
}

std::string Play::fileText() {
  static constexpr const char* kEnds[] = {"\n", "\n", "\n", "\r\n", "\r"};
  std::string made;
  const int32_t lines = m_random.oneIn(10) ? m_random.below(600) : m_random.below(60);
  for (int32_t n = 0; n < lines; ++n) {
    made += line();
    made += kEnds[m_random.below(5)];
  }
  return made;
}

void Play::read() {
  IniSetReadOptions(m_doc.get(), m_random.oneIn(2) ? 22 : m_random.below(16));
  m_digest->add(IniSetDuplicateChecking(m_doc.get(), m_random.oneIn(3) ? 0 : 1));
  const std::string text = fileText();
  m_digest->add(m_source == Source::Lines ? ztini::test::Read(m_doc, text)
                                          : IniReadBytes(m_doc.get(), text.data(), text.size()));
  m_digest->add(m_doc->firstBadLine);
}

void Play::put() {
  const std::string section = m_random.oneIn(30) ? "  " : name("s"), item = name("i");
  const std::string value = text();
  const int32_t way = m_random.below(4);
  int32_t status = 0;
  if (way == 0) {
    constexpr int32_t kQuotes[] = {0, '"', '\'', 256, 'x', -1};
    const int32_t quote = kQuotes[m_random.below(6)];
    status = IniPut(m_doc.get(), section.c_str(), item.c_str(),
                    m_random.oneIn(20) ? nullptr : value.c_str(), quote);
  } else if (way == 1) {
    const int32_t bits = m_random.below(4);
    status = IniPutStringWithOptions(m_doc.get(), section.c_str(), item.c_str(), value.c_str(),
                                     bits & 1, bits >> 1);
  } else if (way == 2) {
    // A value that is a part of the one it replaces.
    const char* present = nullptr;
    IniGet(m_doc.get(), section.c_str(), item.c_str(), &present);
    status = IniPutRawString(m_doc.get(), section.c_str(), item.c_str(),
                             present && *present ? present + 1 : present);
  } else {
    status = IniPutDouble(m_doc.get(), section.c_str(), item.c_str(), m_random.below(1000) / 8.0);
  }
  m_digest->add(status);
}

void Play::remove() {
  const std::string section = name("s");
  switch (m_random.below(4)) {
    case 0:
      m_digest->add(IniRemoveSection(m_doc.get(), section.c_str()));
      break;
    case 1:
      m_digest->add(IniRenameSection(m_doc.get(), section.c_str(), name("s").c_str()));
      break;
    default:
      m_digest->add(IniRemoveItem(m_doc.get(), section.c_str(), name("i").c_str()));
  }
}

void Play::lookUp() {
  const std::string section = name("s"), item = name("i");
  m_digest->add(IniSectionExists(m_doc.get(), section.c_str()));
  m_digest->add(IniItemExists(m_doc.get(), section.c_str(), item.c_str()));
  m_digest->add(IniFindSectionIndex(m_doc.get(), section.c_str()));
  m_digest->add(IniLineOfSection(m_doc.get(), section.c_str()));
  IniSection* found = IniFindSection(m_doc.get(), section.c_str());
  m_digest->add(IniSectionName(found));
  m_digest->add(IniSectionWasReadFromFile(found));
  m_digest->add(IniSectionIsNull(found));
  const int32_t caseSensitive = m_random.below(2);
  m_digest->add(IniFindEntryIndex(found, caseSensitive, item.c_str()));
  m_digest->add(IniEntryName(IniFindEntry(found, caseSensitive, item.c_str())));
}

void Play::values() {
  const std::string section = name("s"), item = name("i");
  const char* value = "unset";
  int32_t status = IniGet(m_doc.get(), section.c_str(), item.c_str(), &value);
  see(status, value);
  status = IniGetPointerToString(m_doc.get(), section.c_str(), item.c_str(), &value);
  see(status, value);
  char* copy = nullptr;
  status = IniGetStringCopy(m_doc.get(), section.c_str(), item.c_str(), &copy);
  see(status, copy);
  free(copy);
  char buffer[8];
  status = IniGetRawStringIntoBuffer(m_doc.get(), section.c_str(), item.c_str(), buffer, 8);
  see(status, buffer);
  int32_t truth = 7;
  uint32_t number = 7;
  double real = 7;
  m_digest->add(IniGetBoolean(m_doc.get(), section.c_str(), item.c_str(), &truth));
  m_digest->add(IniGetUInt(m_doc.get(), section.c_str(), item.c_str(), &number));
  m_digest->add(IniGetDouble(m_doc.get(), section.c_str(), item.c_str(), &real));
  m_digest->add(truth);
  m_digest->add(number);
  m_digest->add(m_doc->lastItemLine);
}

void Play::enumerate() {
  const char* out = nullptr;
  const int32_t n = m_random.below(12) - 2;
  int32_t status = IniNthSectionName(m_doc.get(), n, &out);
  see(status, out);
  const std::string section = out && m_random.oneIn(2) ? out : name("s");
  m_digest->add(IniNumberOfItems(m_doc.get(), section.c_str()));
  status = IniNthItemName(m_doc.get(), section.c_str(), n, &out);
  see(status, out);
  status = IniNthItemPointerToString(m_doc.get(), section.c_str(), n, &out);
  see(status, out);
  // The section of that number is the present one now, even among equal names.
  if (m_random.oneIn(6)) m_digest->add(IniRemoveSection(m_doc.get(), section.c_str()));
}

void Play::showAll() { m_digest->add(ztini::test::Show(m_doc)); }

void Play::write() {
  const int32_t limit = m_random.oneIn(3) ? 20 + m_random.below(60) : -1;
  const int32_t breakCharacter = m_random.oneIn(2) ? ' ' : 0;
  IniSetWriteOptions(m_doc.get(), limit, breakCharacter, m_random.below(32));
  int32_t status = 0;
  for (const std::string& line : ztini::test::WrittenLines(m_doc, &status)) m_digest->add(line);
  m_digest->add(status);
}

void Play::edit() {
  switch (m_random.below(8)) {
    case 0:
    case 1:
    case 2:
      return put();
    case 3:
    case 4:
      return remove();
    case 5:
      return lookUp();
    case 6:
      return values();
    default:
      return enumerate();
  }
}

void Play::run() {
  for (int32_t rounds = 1 + m_random.below(2); rounds; --rounds) {
    read();
    showAll();
    write();
    for (int32_t edits = m_random.below(80); edits; --edits) edit();
    showAll();
    write();
  }
}

class Differential : public testing::TestWithParam<std::tuple<int, Source>> {};

TEST_P(Differential, ResultsAreThoseRecorded) {
  constexpr std::array<uint64_t, 8> kRecorded = {
      0x60f321e633732cdau, 0xcdfea5f240a6f93bu, 0x43063fe6e9f4b9c8u, 0x15bedbb673684a82u,
      0xd2190c068c6d0a9fu, 0x94b4159c9c95dbc5u, 0x96c0cf85688f830eu, 0xc351b6678b592bau,
  };
  const auto [group, source] = GetParam();
  const auto first = static_cast<uint64_t>(group * kDocumentsPerGroup);
  Digest digest;
  for (uint64_t n = 0; n < kDocumentsPerGroup; ++n) Play(first + n, source, &digest).run();
  EXPECT_EQ(digest.value(), kRecorded[static_cast<size_t>(group)])
      << "0x" << std::hex << digest.value() << "u";
}

INSTANTIATE_TEST_SUITE_P(Groups, Differential,
                         testing::Combine(testing::Range(0, 8),
                                          testing::Values(Source::Lines, Source::Bytes)));

}  // namespace
