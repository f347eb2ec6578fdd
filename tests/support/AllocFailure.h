#pragma once

namespace vlt::test {

// Makes the nth allocation by operator new of this thread fail with std::bad_alloc, counted from 1
// from here on; the ones before and behind it succeed. Ends with the object. One at a time.
//
// A program that uses it has its operator new replaced as a whole. malloc() is not touched.
class FailAllocation {
 public:
  explicit FailAllocation(int nth);
  ~FailAllocation();
  FailAllocation(const FailAllocation&) = delete;
  FailAllocation& operator=(const FailAllocation&) = delete;

  // True once the allocation has failed.
  bool happened() const;
};

}  // namespace vlt::test
