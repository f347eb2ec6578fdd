#pragma once

#include <map>
#include <string>

#include "source/IniDocument.h"
#include "source/Snapshot/Opened.h"
#include "tools/common/Arguments.h"
#include "tools/common/Output.h"

// Whether registration files say what the database has of them. A start compares their times alone.
namespace admin {

// The items of a section by name, without what clients acknowledge and starts complete.
using Items = std::map<std::string, std::string>;
Items ItemsOf(const IniDocument& document, const std::string& section);

// The same after a merge of that registration file into the database. Throws what the reader does.
Items ItemsAfterMerge(const vlt::snapshot::Opened& opened, const std::string& file,
                      const std::string& section);

// verify --content.
int VerifyContent(const vltctl::Arguments& arguments, vltctl::Output& output);

}  // namespace admin
