#include "source/Database/contentsWalk.h"

#include <utility>

#include "source/Database/databaseText.h"
#include "source/IniDocument.h"
#include "zt/fnd/osdep/StringCompare.h"

namespace {

// At least two characters in front of the suffix.
constexpr size_t kShortestPieceName = 11;
constexpr size_t kPieceSuffixLength = 9;  // " Line0001"
constexpr size_t kMarkFromEnd = 8;
constexpr size_t kMarkLength = 4;  // "Line"

bool IsPiece(const std::string& name) {
  // By the mark and its place; what follows it is not checked.
  return name.size() >= kShortestPieceName &&
         name.compare(name.size() - kMarkFromEnd, kMarkLength, "Line") == 0;
}

std::string BaseOf(const std::string& name) {
  return name.substr(0, name.size() - kPieceSuffixLength);
}

}  // namespace

std::vector<ContentsItem> ReadContents(const IniDocument& database) {
  std::vector<ContentsItem> items;
  bool inPieces = false;  // The last item may go on with the next piece.
  const IniDocument::Section contents(database, registrar::kContents);
  const int count = contents.count();
  items.reserve(static_cast<size_t>(count));
  for (int i = 0; i < count; ++i) {
    std::string name = contents.itemName(i + 1);
    const char* found = contents.itemValue(i + 1);
    std::string value = found ? found : "";
    bool piece = IsPiece(name);
    std::string component = piece ? BaseOf(name) : std::move(name);
    // Neighbours only: two runs of one name are two items.
    if (piece && inPieces && items.back().component == component) {
      items.back().file += value;
      items.back().last = i;
    } else {
      items.push_back({std::move(component), std::move(value), i, i, piece});
    }
    inPieces = piece;
  }
  return items;
}

bool ContentsFiles::CaseLess::operator()(const std::string& a, const std::string& b) const {
  return zt::fnd::osdep::StringCaseCompare(a.c_str(), b.c_str()) < 0;
}

void ContentsFiles::learn(const std::vector<ContentsItem>& items) {
  forget();
  for (const ContentsItem& item : items) {
    // Not known from here on: what a change joins or parts cannot be followed by name.
    if (item.inPieces) return;
    m_files.insert(item.file);
  }
  m_known = true;
}

void ContentsFiles::add(const IniDocument& database, const std::string& item) {
  if (!m_known) return;
  // Both as they are kept: a name loses the white space around it, and a new one comes last.
  std::string name, file;
  int count = database.GetNumberOfItems(registrar::kContents);
  if (database.GetNthItemName(registrar::kContents, count, &name) < 0 || IsPiece(name)) {
    forget();
  } else {
    database.GetItem(registrar::kContents, item.c_str(), &file);
    m_files.insert(file);
  }
}

void ContentsFiles::forget() {
  m_known = false;
  m_files.clear();
}
