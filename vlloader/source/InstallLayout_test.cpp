#include "vlloader/source/InstallLayout.h"

#include <gtest/gtest.h>

#include "tests/support/InChild.h"
#include "tests/support/Installation.h"
#include "zt/fnd/Exception.h"

namespace {

using vlt::test::Installation;
using zt::fnd::AnsiString;
using zt::fnd::String;
namespace layout = vlt::layout;

std::string Narrow(const String& text) { return AnsiString(text).c_str(); }

TEST(InstallLayout, OneSlashStandsBetweenDirectoryAndName) {
  for (const wchar_t* directory : {L"/kor", L"/kor/"}) {
    EXPECT_EQ(Narrow(layout::FileIn(directory, layout::kDatabase)), "/kor/vlt.vlr");
    EXPECT_EQ(Narrow(layout::DirectoryIn(directory, layout::kData)), "/kor/Data/");
  }
  EXPECT_EQ(Narrow(layout::FileIn(L"/", layout::kHookFile)), "/VLTHooks.ini");
}

TEST(InstallLayout, NothingLiesInNoDirectory) {
  EXPECT_THROW(layout::FileIn(String(), L"x"), zt::fnd::exception::InvalidArgument);
  EXPECT_THROW(layout::DirectoryIn(String(), L"x"), zt::fnd::exception::InvalidArgument);
}

TEST_IN_CHILD(InstallLayout, TheRootIsThePreferenceWithASlash) {
  Installation installation;
  EXPECT_EQ(Narrow(layout::InstallRoot()), installation.root() + "/");
}

}  // namespace
