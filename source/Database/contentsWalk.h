#pragma once

#include <set>
#include <string>
#include <vector>

class IniDocument;

// An item of "VLRContentsSection" as it was meant: a component and the registration file it came
// from.
struct ContentsItem {
  std::string component;
  std::string file;
  // Positions, from 0, of the items of the section that it consists of.
  int first, last;
  bool inPieces;  // also where there is but one
};

// The section's items. A long one may be in pieces, "name Line0001", "name Line0002" and so on:
// neighbours of one such name are put together. The parser does that too for runs that are whole;
// what is met here is the rest. Names shorter than 11 characters are never pieces.
std::vector<ContentsItem> ReadContents(const IniDocument& database);

// The registration files that the section's items hold, whatever the case of their letters: known
// from one walk, so that not each of the new files of a first start needs a walk that finds
// nothing.
//
// Kept in step by whoever changes the section. What a change does to items in pieces is left to the
// next walk: it may join others.
class ContentsFiles {
 public:
  // False only if no item has the file.
  bool mayHave(const std::string& file) const { return !m_known || m_files.count(file) != 0; }

  // All items, from a walk.
  void learn(const std::vector<ContentsItem>& items);
  // The item has been set.
  void add(const IniDocument& database, const std::string& item);
  // The section has been changed in some other way.
  void forget();

 private:
  struct CaseLess {
    bool operator()(const std::string& a, const std::string& b) const;
  };
  bool m_known = false;
  std::set<std::string, CaseLess> m_files;
};
