#pragma once

#include <stdexcept>
#include <string>
#include <system_error>

#include "source/Snapshot/Rehearsal.h"
#include "source/Snapshot/snapshot.hpp"
#include "zt/fnd/osdep/OSException.h"

namespace vlt::snapshot {

// An installation with its database's bytes.
struct Opened {
  Place place;
  Database database;
  std::string bytes;
};

// Throw std::runtime_error for no directory, and what ReadDatabase throws.
Opened OpenInForce();
Opened OpenAt(const std::string& root);

// Whether a registrar begins with what a database in this state holds.
bool IsTaken(DatabaseState state);

// The library's exceptions end here: they are no part of the interface.
template <class Step>
auto WithStandardErrors(Step step) {
  try {
    return step();
  } catch (const zt::fnd::osdep::PosixError& error) {
    throw std::system_error(static_cast<int>(error.whatcode()), std::generic_category(),
                            "the installation cannot be read");
  } catch (const zt::fnd::exception::Exception& error) {
    throw std::runtime_error(error.what());
  }
}

}  // namespace vlt::snapshot
