#pragma once

#include <string>
#include <vector>

namespace vltctl {

// Takes the locale of the environment. Where that shows nothing beyond ASCII - services and cron jobs
// have no LANG - characters are those of C.UTF-8, so that no name is left out or garbled.
void SetLocale();

// True if the environment's locale was replaced. The library follows the locale of its process: in a
// program that is started with this environment it does not find components whose names or paths
// go beyond ASCII.
bool LocaleWasReplaced();

// A component's name, and all its texts that a locale may not have.
struct NamedTexts {
  std::string name, texts;
};

// What to note of components that such a program would not find; empty if there is nothing to say.
std::string LocaleNote(const std::vector<NamedTexts>& components);

}  // namespace vltctl
