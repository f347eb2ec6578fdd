#include "source/Pharlap/contentsWalk.h"

#include "source/Pharlap/registrarText.h"
#include "source/vlIniMgr.h"

namespace {

constexpr size_t kShortestPieceName = 11;
constexpr size_t kPieceSuffixLength = 9;  // " Line0001"
constexpr size_t kMarkFromEnd = 8;
constexpr size_t kMarkLength = 4;  // "Line"

bool IsPiece(const std::string& name) {
  return name.size() >= kShortestPieceName &&
         name.compare(name.size() - kMarkFromEnd, kMarkLength, "Line") == 0;
}

std::string BaseOf(const std::string& name) {
  return name.substr(0, name.size() - kPieceSuffixLength);
}

}  // namespace

std::vector<ContentsItem> ReadContents(const CvlIniMgr& database) {
  std::vector<ContentsItem> items;
  bool inPieces = false;  // The last item may go on with the next piece.
  int count = database.GetNumberOfItems(registrar::kContents);
  for (int i = 0; i < count; ++i) {
    std::string name, value;
    if (database.GetNthItemName(registrar::kContents, i + 1, &name) < 0) continue;
    database.GetItem(registrar::kContents, name.c_str(), &value);
    bool piece = IsPiece(name);
    std::string component = piece ? BaseOf(name) : name;
    if (piece && inPieces && items.back().component == component) {
      items.back().file += value;
      items.back().last = i;
    } else {
      items.push_back({component, value, i, i});
    }
    inPieces = piece;
  }
  return items;
}
