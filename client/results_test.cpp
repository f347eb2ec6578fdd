#include "client/results.hpp"

#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>
#include <set>
#include <string>

#include "source/Common/ZtUtils/General/ztStreamInterfaces.h"
#include "source/Common/vltTypes.h"
#include "zt/fnd/Exception.h"
#include "zt/fnd/osdep/OSException.h"

namespace {

const vlt::ResultInfo* Row(const char* name) {
  for (const vlt::ResultInfo& row : vlt::kResults) {
    if (strcmp(row.name, name) == 0) return &row;
  }
  return nullptr;
}

TEST(results, EveryResultOfTheSurfaceHasItsNameAndCode) {
#define ROW(name) \
  { #name, name }
  const struct {
    const char* name;
    HRESULT code;
  } rows[] = {ROW(S_OK),
              ROW(S_FALSE),
              ROW(E_NOTIMPL),
              ROW(E_NOINTERFACE),
              ROW(E_POINTER),
              ROW(E_FAIL),
              ROW(E_UNEXPECTED),
              ROW(E_OUTOFMEMORY),
              ROW(E_INVALIDARG),
              ROW(VLT_E_NO_COMPONENT),
              ROW(VLT_E_NO_BINDING_CLASSES),
              ROW(VLT_E_UUID_LIBRARY),
              ROW(VLT_E_UUID_ENTRY),
              ROW(ZT_E_END_OF_STREAM),
              ROW(ZT_E_ACCESS_DENIED)};
#undef ROW
  for (const auto& row : rows) {
    ASSERT_TRUE(Row(row.name)) << row.name;
    EXPECT_EQ(static_cast<HRESULT>(Row(row.name)->code), row.code) << row.name;
  }
}

TEST(results, EveryExceptionHasItsNameAndCode) {
  using namespace zt::fnd::exception;
#define CODE(name) \
  { #name, name().getErrorCode() }
  const struct {
    const char* name;
    uint32_t code;
  } rows[] = {CODE(Exception),
              CODE(OutOfRange),
              CODE(BoundExceeded),
              CODE(ObjectAlreadyExists),
              CODE(NonexistentException),
              CODE(InvalidOperation),
              CODE(InvalidArgument),
              CODE(InitializationFailure),
              CODE(FileWriteFailed),
              CODE(FileReadFailed),
              CODE(DeserializationError),
              CODE(BufferOverflow),
              {"AccessDenied", AccessDenied("").getErrorCode()},
              {"PosixError", zt::fnd::osdep::PosixError(ENOENT).getErrorCode()},
              {"OSException", zt::fnd::osdep::PosixError(EIO).getErrorCode()},
              CODE(FileAlreadyExists),
              CODE(InvalidLocale),
              CODE(InvalidSequence),
              CODE(BadGuidString),
              CODE(UnableToConvert)};
#undef CODE
  for (const auto& row : rows) {
    ASSERT_TRUE(Row(row.name)) << row.name;
    EXPECT_EQ(Row(row.name)->code, row.code) << row.name;
  }
}

TEST(results, NoNameStandsTwiceAndEachHasAMeaning) {
  std::set<std::string> names;
  for (const vlt::ResultInfo& row : vlt::kResults) {
    EXPECT_TRUE(names.insert(row.name).second) << row.name;
    EXPECT_GT(strlen(row.meaning), 0u) << row.name;
    EXPECT_NE(row.meaning[strlen(row.meaning) - 1], '.') << row.name;
  }
}

TEST(results, ACodeIsFoundOrIsNot) {
  EXPECT_STREQ(vlt::FindResult(0x80040326)->name, "VLT_E_UUID_ENTRY");
  EXPECT_STREQ(vlt::FindResult(0x8ABC7007)->name, "OutOfRange");
  EXPECT_EQ(vlt::FindResult(0x12345678), nullptr);
}

}  // namespace
