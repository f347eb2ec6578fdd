#include "zt/fnd/RefCounted.h"

#include <gtest/gtest.h>

namespace zt::fnd {
namespace {

struct Thing : RefCountedThreadSafePolicy {
  static inline int alive = 0;
  Thing() { ++alive; }
  ~Thing() override { --alive; }
};

TEST(BufferRefPtr, ObjectGoesWithItsLastReference) {
  {
    RefPtr<Thing> a(new Thing);
    RefPtr<Thing> b(a), c;
    c = b;
    a = nullptr;
    b = RefPtr<Thing>();
    EXPECT_EQ(1, Thing::alive);
    RefPtr<Thing>& self = c;
    c = self;
    EXPECT_EQ(1, Thing::alive);
  }
  EXPECT_EQ(0, Thing::alive);
}

TEST(BufferRefPtr, DetachedReferenceIsNotReleased) {
  Thing* raw = RefPtr<Thing>(new Thing).detach();
  EXPECT_EQ(1, Thing::alive);
  raw->release();
  EXPECT_EQ(0, Thing::alive);
}

}  // namespace
}  // namespace zt::fnd
