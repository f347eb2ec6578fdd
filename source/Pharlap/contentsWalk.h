#pragma once

#include <string>
#include <vector>

class CvlIniMgr;

// An item of "VLRContentsSection" as it was meant: a component and the registration file it came
// from.
struct ContentsItem {
  std::string component;
  std::string file;
  // Positions, from 0, of the items of the section that it stands in.
  int first, last;
};

// The section's items. A long one may stand in pieces, "name Line0001", "name Line0002" and so on:
// neighbours of one such name are put together. The parser does that too for runs that are whole;
// what is met here is the rest. Names shorter than 11 characters are never pieces.
std::vector<ContentsItem> ReadContents(const CvlIniMgr& database);
