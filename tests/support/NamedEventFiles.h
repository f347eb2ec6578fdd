#pragma once

#include <gtest/gtest.h>

#include <cstring>
#include <memory>
#include <string>

#include "tests/support/PosixErrorOf.h"
#include "tests/support/TempDir.h"
#include "zt/fnd/osdep/NamedEvent.h"
#include "zt/fnd/osdep/events/EventStateFile.h"

namespace vlt::test {

inline auto OpenEvent(const std::string& name, bool manual = true, bool initial = false) {
  return std::make_unique<zt::fnd::osdep::NamedEvent>(Wide(name), manual, initial);
}

// The head of a state file, read from the disk; fails the test if there is none.
inline zt::fnd::osdep::SetHeader HeaderOf(const std::string& path) {
  using zt::fnd::osdep::SetHeader;
  std::string bytes = ReadBytes(path);
  SetHeader header;
  SetHeader::Bytes head = {};
  if (bytes.size() >= head.size()) std::memcpy(head.data(), bytes.data(), head.size());
  EXPECT_TRUE(header.decode(head)) << path;
  return header;
}

// The record of a slot in it.
inline zt::fnd::osdep::SlotRecord RecordOf(const std::string& path, unsigned slot) {
  using zt::fnd::osdep::SlotRecord;
  std::string bytes = ReadBytes(path);
  SlotRecord::Bytes record = {};
  std::size_t at = static_cast<std::size_t>(SlotRecord::Offset(slot));
  EXPECT_GE(bytes.size(), at + record.size());
  bytes.resize(at + record.size());
  std::memcpy(record.data(), bytes.data() + at, record.size());
  return SlotRecord::Decode(record);
}

}  // namespace vlt::test
