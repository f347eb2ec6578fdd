#pragma once

// Names of the points where a fault can be injected.
//
// The texts are frozen: hook files in the field name them. They look like places in the source, and
// once were; they do not follow the code any more. TestHookNT stands before an allocation that
// reports failure by a result, TestHook before one that throws.
namespace vlt::hook {

inline constexpr const char* kGetRegistrar2 = "TestHookNT\"./source/Utilities/vltutils\"1215";
inline constexpr const char* kCheckComponent = "TestHookNT\"./source/Utilities/vltCheck\"369";
inline constexpr const char* kJarOpen = "TestHookNT\"./source/Utilities/vltutils\"2653";
inline constexpr const char* kJarRetry = "TestHookNT\"./source/Utilities/vltutils\"2663";
// Moments of a save: the file is written and its sidecar is old; the sidecar is written.
inline constexpr const char* kJarInvalidChecksumSet = "vltjarInvalidChecksumSet";
inline constexpr const char* kJarValidChecksumSet = "vltjarValidChecksumSet";
inline constexpr const char* kGetComponentsForBindingClass =
    "TestHookNT\"./source/Common/vltcmn\"1330";
inline constexpr const char* kCopyComponentOfClass = "TestHook\"./source/Common/vltcmn\"1317";
inline constexpr const char* kAddBindingClass = "TestHook\"./source/Common/vltcmn\"1358";
inline constexpr const char* kGetComponentVector =
    "TestHook\"./source/Common/vltBindingClasses\"102";
inline constexpr const char* kDuplicateString2 =
    "TestHookNT\"./source/Common/vltDuplicateString2\"19";
inline constexpr const char* kAppendString2 = "TestHookNT\"./source/Common/vltDuplicateString2\"42";
inline constexpr const char* kStringFromClsid = "TestHookNT\"./source/Common/vltTypeToString2\"77";

}  // namespace vlt::hook
