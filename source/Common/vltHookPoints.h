#pragma once

// Names of the points where a fault can be injected.
//
// The texts are frozen: hook files in the field name them. They look like places in the source, and
// once were; they do not follow the code any more. TestHookNT is before an allocation that
// reports failure by a result, TestHook before one that throws.
namespace vlt::hook {

inline constexpr const char* kGetRegistrar2 = "TestHookNT\"./source/Utilities/vltutils\"1215";
inline constexpr const char* kCheckComponent = "TestHookNT\"./source/Utilities/vltCheck\"369";
inline constexpr const char* kJarOpen = "TestHookNT\"./source/Utilities/vltutils\"2653";
inline constexpr const char* kJarRetry = "TestHookNT\"./source/Utilities/vltutils\"2663";
// Moments of a save: the file is written and its sidecar is old; the sidecar is written.
inline constexpr const char* kJarInvalidChecksumSet = "vltjarInvalidChecksumSet";
inline constexpr const char* kJarValidChecksumSet = "vltjarValidChecksumSet";
inline constexpr const char* kArrayI32 = "TestHookNT\"./source/Common/vltcmn\"96";
inline constexpr const char* kArrayU32 = "TestHookNT\"./source/Common/vltcmn\"111";
inline constexpr const char* kArrayF64 = "TestHookNT\"./source/Common/vltcmn\"126";
inline constexpr const char* kArrayGuid = "TestHookNT\"./source/Common/vltcmn\"141";
inline constexpr const char* kArrayString = "TestHookNT\"./source/Common/vltcmn\"158";
inline constexpr const char* kArrayReference = "TestHookNT\"./source/Common/vltcmn\"174";
inline constexpr const char* kConvertQueryToString = "TestHookNT\"./source/Common/vltcmn\"1132";
inline constexpr const char* kMarshalQueryFromStream = "TestHookNT\"./source/Common/vltcmn\"1257";
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

// A point and what happens there, for lists that people read.
struct Point {
  const char* name;
  const char* where;
};

// All of them.
inline constexpr Point kPoints[] = {
    {kGetRegistrar2, "creating the registrar"},
    {kJarOpen, "opening the jar or a settings file"},
    {kJarRetry, "opening it again after a failure"},
    {kCheckComponent, "the list of the component check"},
    {kArrayI32, "an array value as text: i32"},
    {kArrayU32, "an array value as text: u32"},
    {kArrayF64, "an array value as text: f64"},
    {kArrayGuid, "an array value as text: GUID"},
    {kArrayString, "an array value as text: string"},
    {kArrayReference, "an array value as text: reference"},
    {kConvertQueryToString, "a query as text"},
    {kMarshalQueryFromStream, "a query from a stream"},
    {kGetComponentsForBindingClass, "the components of a binding class"},
    {kCopyComponentOfClass, "each of them; throws"},
    {kAddBindingClass, "entering an expert's second class; throws"},
    {kGetComponentVector, "the components of a binding text; throws"},
    {kDuplicateString2, "copying a text"},
    {kAppendString2, "appending to a text"},
    {kStringFromClsid, "a GUID as text"},
    {kJarInvalidChecksumSet, "a save: the file is written, its sidecar is old"},
    {kJarValidChecksumSet, "a save: the sidecar is written"},
};

}  // namespace vlt::hook
