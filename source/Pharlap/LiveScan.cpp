#include "source/Pharlap/LiveScan.h"

#include <utility>

#include "source/Common/vltResultOf.h"
#include "source/vlIniMgr.h"

namespace registrar {

LiveScan::~LiveScan() = default;

bool LiveScan::openFragment(const std::string& file) {
  beginFile();
  // A file that cannot be parsed has been set aside by its manager already. Any other reason - no
  // memory, no descriptor - says nothing about the file, which stays.
  return vlt::Attempt([&] { m_fragment.reset(new CvlIniMgr(CvlIniMgr::OpenForUpdate(file))); });
}

std::unique_ptr<CvlIniMgr> LiveScan::takeFragment(const std::string& file) {
  if (!m_fragment) openFragment(file);
  return std::move(m_fragment);
}

}  // namespace registrar
