#include "zt/fnd/osdep/OSException.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

namespace zt::fnd::osdep {
namespace {

TEST(OSException, PlainFormsKeepTheirOwnSmallCode) {
  EXPECT_STREQ("Unknown error", OSException().what());
  EXPECT_EQ(0u, OSException().whatcode());
  EXPECT_EQ(42u, OSException().getErrorCode());
  OSException e("m", 2);
  EXPECT_STREQ(e.what(), "m");
  EXPECT_EQ(e.whatcode(), 2u);
  EXPECT_EQ(e.getErrorCode(), 42u);  // 7 belongs to the two derived classes
}

TEST(OSException, PosixErrorMapsNothingAndNotFound) {
  const struct {
    int errnum;
    unsigned int code;
  } rows[] = {{0, 0}, {2, 7}, {13, 42}, {-43, 42}, {-1, 42}, {100000, 42}};
  for (const auto& row : rows) {
    EXPECT_EQ(row.code, PosixError(row.errnum).getErrorCode()) << row.errnum;
    EXPECT_EQ(static_cast<unsigned int>(row.errnum), PosixError(row.errnum).whatcode());
  }
}

TEST(OSException, PosixErrorHasTheSystemsText) {
  EXPECT_STREQ(strerror(ENOENT), PosixError(ENOENT).what());
  EXPECT_STREQ(strerror(0), PosixError(0).what());
  EXPECT_STREQ(strerror(100000), PosixError(100000).what());
  EXPECT_STREQ(PosixError("own", EACCES).what(), "own");
  EXPECT_EQ(static_cast<unsigned int>(EACCES), PosixError("own", EACCES).whatcode());
  EXPECT_STREQ(PosixError(nullptr, 1).what(), "");
}

TEST(OSException, PosixErrorTakesTheErrnoOfTheFailedCall) {
  EXPECT_EQ(-1, close(-1));
  PosixError e;
  EXPECT_EQ(static_cast<unsigned int>(EBADF), e.whatcode());
  EXPECT_STREQ(strerror(EBADF), e.what());
  errno = 0;
  try {
    close(-1);
    ZT_RAISE(PosixError());
  } catch (const OSException& caught) {
    EXPECT_EQ(static_cast<unsigned int>(EBADF), caught.whatcode());
  }
}

TEST(OSException, CarbonErrorSignExtendsItsStatus) {
  EXPECT_STREQ("Unknown error code", CarbonError(-43).what());
  EXPECT_EQ(7u, CarbonError(-43).getErrorCode());
  EXPECT_EQ(0xFFFFFFD5u, CarbonError(-43).whatcode());
  EXPECT_EQ(0u, CarbonError(short(0)).getErrorCode());
  EXPECT_EQ(42u, CarbonError(2).getErrorCode());
  EXPECT_EQ(42u, CarbonError(-1).getErrorCode());
  EXPECT_STREQ("own", CarbonError("own", 5).what());
  EXPECT_EQ(5u, CarbonError("own", 5).whatcode());
}

TEST(OSException, OneHandlerCatchesAllThree) {
  EXPECT_THROW(ZT_RAISE(PosixError(1)), OSException);
  EXPECT_THROW(ZT_RAISE(CarbonError(1)), OSException);
  EXPECT_THROW(ZT_RAISE(OSException()), exception::Exception);
}

}  // namespace
}  // namespace zt::fnd::osdep
