#include "source/Common/vltResultOf.h"

#include <gtest/gtest.h>

#include <exception>
#include <new>
#include <stdexcept>

namespace {

TEST(vltResultOf, IsWhatTheStepReturns) {
  EXPECT_EQ(vlt::ResultOf(E_FAIL, [] { return S_FALSE; }), S_FALSE);
  EXPECT_EQ(vlt::ResultOf<std::bad_alloc>(E_FAIL, [] { return E_POINTER; }), E_POINTER);
}

TEST(vltResultOf, IsTheFailureForWhatIsThrown) {
  EXPECT_EQ(vlt::ResultOf(E_UNEXPECTED, []() -> HRESULT { throw 1; }), E_UNEXPECTED);
  EXPECT_EQ(
      vlt::ResultOf<std::exception>(E_OUTOFMEMORY, []() -> HRESULT { throw std::bad_alloc(); }),
      E_OUTOFMEMORY);
}

TEST(vltResultOf, LetsOtherClassesPass) {
  auto run = [] {
    return vlt::ResultOf<std::bad_alloc>(E_FAIL, []() -> HRESULT { throw std::logic_error(""); });
  };
  EXPECT_THROW(run(), std::logic_error);
}

TEST(vltResultOfAttempt, SucceedsAtTheEndOfTheStepOrByItsAnswer) {
  EXPECT_TRUE(vlt::Attempt([] {}));
  EXPECT_TRUE(vlt::Attempt([] { return true; }));
  EXPECT_FALSE(vlt::Attempt([] { return false; }));
  EXPECT_FALSE(vlt::Attempt([] { throw 1; }));
  EXPECT_FALSE(vlt::Attempt<std::bad_alloc>([] { throw std::bad_alloc(); }));
  EXPECT_THROW(vlt::Attempt<std::bad_alloc>([] { throw 1; }), int);
}

}  // namespace
