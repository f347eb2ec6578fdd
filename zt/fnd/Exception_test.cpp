#include "zt/fnd/Exception.h"

#include <gtest/gtest.h>

#include <cstring>
#include <new>
#include <string>
#include <type_traits>

#include "tests/support/FailingHeap.h"
#include "zt/fnd/NumericCast.h"
#include "zt/fnd/SafeInteger.h"

namespace zt::fnd::exception {
namespace {

// Nothing in the library reads the place of a throw back; a debugger does, and so do we.
struct Place : Exception {
  static uint32_t lineOf(const Exception& e) { return e.*&Place::line; }
  static const char* fileOf(const Exception& e) { return e.*&Place::file; }
};

struct Row {
  const Exception& exception;
  uint32_t code;
  const char* text;
};

TEST(Exception, EveryClassHasItsCodeAndText) {
  const Row rows[] = {
      {Exception(), 0xFFFFFFFFu, "unspecified exception"},
      {OutOfRange(), 0x8ABC7007u, "Out of range"},
      {OutOfRange2("x"), 0x8ABC7007u, "Out of range: x"},
      {BoundExceeded(), 0x8ABC7007u, "A request was made that would exceed the bounds"},
      {BoundExceeded2("y z"), 0x8ABC7007u, "A request was made that would exceed the bounds: y z"},
      {ObjectAlreadyExists(), 0x8ABC7009u, "Object already exists"},
      {NonexistentException(), 0x8ABC700Au, "The object does not exist"},
      {InvalidOperation(), 0x8ABC700Eu, "Invalid operation"},
      {InvalidArgument(), 0x8ABC700Fu, "Invalid argument(s)"},
      {InvalidArgument2("bad"), 0x8ABC700Fu, "Invalid argument(s): bad"},
      {InitializationFailure(), 0x8ABC7010u, "Initialization failed"},
      {FileWriteFailed(), 0x8ABC7011u, "Write file operation failed"},
      {FileReadFailed(), 0x8ABC7012u, "Read file operation failed"},
      {DeserializationError(), 0x8ABC7014u, "Failed to deserialize"},
      {BufferOverflow(), 0x8ABC7017u, "Buffer overflowed"},
      {AccessDenied("/a/b"), 0x8ABC7019u, "Access denied: /a/b"},
      {FileAlreadyExists(), 0x8ABC701Bu, "File already exists"},
      {InvalidLocale(), 0x8ABC7024u, "Invalid locale"},
      {InvalidSequence(), 0x8ABC7030u, "Invalid UTF8 encoding sequence"},
      {BadGuidString(), 0x8ABC7032u, "Badly formatted Guid string."},
      {UnableToConvert(), 0x8ABC7034u, "Unable to convert."},
      {NotImplemented(), 0x80004001u, "Not implemented"},
  };
  for (const Row& row : rows) {
    EXPECT_EQ(row.code, row.exception.getErrorCode()) << row.text;
    EXPECT_STREQ(row.text, row.exception.what());
  }
}

TEST(Exception, DetailIsAppendedWholeAndNullCountsAsEmpty) {
  std::string detail(100000, 'd');
  EXPECT_EQ("Out of range: " + detail, OutOfRange2(detail.c_str()).what());
  EXPECT_STREQ(AccessDenied(nullptr).what(), "Access denied: ");
  EXPECT_STREQ(InvalidArgument2("").what(), "Invalid argument(s): ");
}

TEST(Exception, DirectBasesAreAsTheHandlersExpect) {
  EXPECT_TRUE((std::is_base_of_v<std::exception, Exception>));
  EXPECT_TRUE((std::is_base_of_v<OutOfRange, OutOfRange2>));
  EXPECT_TRUE((std::is_base_of_v<BoundExceeded, BoundExceeded2>));
  EXPECT_TRUE((std::is_base_of_v<InvalidArgument, InvalidArgument2>));
  EXPECT_FALSE((std::is_base_of_v<OutOfRange, BoundExceeded>));
  EXPECT_FALSE((std::is_base_of_v<BoundExceeded, OutOfRange>));
}

TEST(Exception, DetailedFormIsCaughtAsItsBase) {
  try {
    ZT_RAISE(OutOfRange2("x"));
  } catch (const OutOfRange& e) {
    EXPECT_STREQ(e.what(), "Out of range: x");
  }
  EXPECT_THROW(ZT_RAISE(InvalidArgument2("bad")), InvalidArgument);
}

TEST(Exception, BoundExceededIsNotCaughtAsOutOfRangeThoughTheCodesAreEqual) {
  bool caught = false;
  try {
    ZT_RAISE(BoundExceeded2("x"));
  } catch (const OutOfRange&) {
    FAIL() << "caught as OutOfRange";
  } catch (const BoundExceeded& e) {
    caught = true;
    EXPECT_EQ(OutOfRange().getErrorCode(), e.getErrorCode());
  }
  EXPECT_TRUE(caught);
}

TEST(Exception, UnstampedUntilRaised) {
  OutOfRange e;
  EXPECT_EQ(Place::lineOf(e), 0u);
  EXPECT_EQ(Place::fileOf(e), nullptr);
}

TEST(Exception, RaiseStampsLineAndSourcePathWithoutExtension) {
  uint32_t line = 0;
  try {
    line = __LINE__ + 1;
    ZT_RAISE(AccessDenied("/x"));
  } catch (const Exception& e) {
    EXPECT_EQ(line, Place::lineOf(e));
    EXPECT_STREQ(Place::fileOf(e), "zt/fnd/Exception_test");
    EXPECT_STREQ(e.what(), "Access denied: /x");
  }
}

TEST(Exception, RaiseFromAHeaderStampsTheHeader) {
  try {
    SafeInteger<unsigned int>::Add(0xFFFFFFFFu, 1);
    FAIL();
  } catch (const OutOfRange& e) {
    EXPECT_STREQ(Place::fileOf(e), "zt/fnd/SafeInteger");
    EXPECT_NE(Place::lineOf(e), 0u);
  }
  try {
    NumericCast<unsigned int>(-1);
    FAIL();
  } catch (const OutOfRange& e) {
    EXPECT_STREQ(Place::fileOf(e), "zt/fnd/NumericCast");
  }
}

TEST(Exception, RaiseThrowsACopyAndKeepsTheDynamicClass) {
  OutOfRange2 original("x");
  try {
    ZT_RAISE(original);
  } catch (const OutOfRange2& e) {
    EXPECT_NE(&original, &e);
  }
  EXPECT_EQ(Place::lineOf(original), 0u);
}

TEST(Exception, CopyHasAMessageAndAPlaceOfItsOwn) {
  std::string text;
  Exception const* copied = nullptr;
  try {
    ZT_RAISE(AccessDenied("detail that needs a block of its own, being long"));
  } catch (const AccessDenied& e) {
    AccessDenied copy(e);
    EXPECT_NE(static_cast<const void*>(e.what()), copy.what());
    EXPECT_STREQ(e.what(), copy.what());
    EXPECT_EQ(Place::lineOf(e), Place::lineOf(copy));
    EXPECT_EQ(Place::fileOf(e), Place::fileOf(copy));
    copied = &copy;
  }
  EXPECT_NE(copied, nullptr);
}

TEST(Exception, StemKeepsDotsInDirectories) {
  EXPECT_STREQ(detail::FileStem("a.b/c").text, "a.b/c");
  EXPECT_STREQ(detail::FileStem("a/b.c.cpp").text, "a/b.c");
  EXPECT_STREQ(detail::FileStem("a.h").text, "a");
}

TEST(Exception, FailedAllocationOfTheMessageBecomesBadAlloc) {
  const std::string detail(200, 'd');
  int failures = 0;
  bool raised = false;
  for (int nth = 1; nth < 20 && !raised; ++nth) {
    vlt::test::FailAllocation fail(nth);
    try {
      ZT_RAISE(OutOfRange2(detail.c_str()));
    } catch (const std::bad_alloc&) {
      ++failures;
    } catch (const OutOfRange2&) {
      raised = true;
    }
  }
  EXPECT_TRUE(raised);
  EXPECT_GE(failures, 3);  // the message, the stamped object, the thrown copy
}

}  // namespace
}  // namespace zt::fnd::exception
