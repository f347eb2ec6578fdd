#pragma once

#include <memory>
#include <string>

#include "source/Database/Scan.h"

class CvlIniMgr;

namespace registrar {

// The registrar's scan: it opens the registration files as guarded files, which sets aside what
// cannot be parsed. Lives for one CvltPharlapRegistrar::UpdateRegistrationFile. Threads: one.
class LiveScan : public Scan {
 public:
  using Scan::Scan;
  ~LiveScan() override;

  // Opens the registration file for takeFragment. False if it cannot be used. One that cannot be
  // parsed has been set aside then; any other failure leaves it.
  bool openFragment(const std::string& file);
  // The file that was opened last; opens it if there is none. Null if it cannot be used.
  std::unique_ptr<CvlIniMgr> takeFragment(const std::string& file);

 private:
  std::unique_ptr<CvlIniMgr> m_fragment;
};

}  // namespace registrar
