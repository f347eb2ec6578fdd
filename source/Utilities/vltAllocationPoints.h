#pragma once

// Allocations of the exports whose failure is a result: the hook point before each, and the
// function that reports it.

#include "source/Common/vltHookPoints.h"
#include "source/Common/vltTestHook.h"

namespace vlt {

// The texts are frozen: hook files name the points, and administrators look for the signatures.
struct AllocationPoint {
  const char* hookPoint;
  const char* signature;  // as vltReportOutOfMemory takes it
};

inline constexpr AllocationPoint kRegistrarPoint = {
    hook::kGetRegistrar2, "HRESULT vltGetRegistrar2(const TCHAR*, const TCHAR*, IvltRegistrar**)"};
inline constexpr AllocationPoint kErrorListPoint = {hook::kCheckComponent,
                                                    "BOOL vltCheckComponent(vltID, IEnumString**)"};
inline constexpr AllocationPoint kJarPoint = {
    hook::kJarOpen, "HRESULT VltjarOpenIniWithValidation(const wchar_t*, CvlIniMgr**)"};

// What `make` returns; null where the hook says so.
template <class Make>
auto Allocate(const AllocationPoint& point, Make make) -> decltype(make()) {
  const char* hookPoint = point.hookPoint;
  return hook::Strikes(hookPoint) ? nullptr : make();
}

}  // namespace vlt
