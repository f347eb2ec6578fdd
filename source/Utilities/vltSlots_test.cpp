// The order of the operations in the dispatch tables, which programs that were built long ago count
// on.
#include <gtest/gtest.h>

#include "source/Pharlap/vltPharlapRegistrar.h"
#include "source/Posix/vltLinuxRegistrar.h"
#include "source/Utilities/vltCheck.h"
#include "tests/support/SlotOf.h"

namespace vlt::test {
namespace {

// Each operation has the slot after the one before it.
template <class... Members>
void ExpectSlotsFrom(size_t first, Members... members) {
  size_t expected = first;
  for (size_t slot : {SlotOf(members)...}) EXPECT_EQ(slot, expected++);
}

TEST(vltSlots, OfTheInterfaces) {
  using R = IvltRegistrar;
  using R2 = IvltRegistrar2;
  ExpectSlotsFrom(0, &R::QueryInterface, &R::AddRef, &R::Release, &R::GetConfigurationPath,
                  &R::SetConfigurationPath, &R::GetSDKPath, &R::SetSDKPath, &R::GetSchemaVersion,
                  &R::SetSchemaVersion, &R::RegisterComponent, &R::UnregisterComponent,
                  &R::GetComponent, &R::EnumComponents, &R2::GetStorageServerCacheSize,
                  &R2::SetStorageServerCacheSize, &R2::GetStorageClientCacheSize,
                  &R2::SetStorageClientCacheSize, &R2::GetSnapshotPath, &R2::SetSnapshotPath);
  EXPECT_EQ(SlotOf(&R::GetConfigurationPath), 3u);
  EXPECT_EQ(SlotOf(&R::EnumComponents), 12u);
  EXPECT_EQ(SlotOf(&R2::GetStorageServerCacheSize), 13u);
  EXPECT_EQ(SlotOf(&R2::SetSnapshotPath), 18u);
}

TEST(vltSlots, OfTheSideInterfaces) {
  ExpectSlotsFrom(3, &IvltPharlapRegistrarEx::ResetDDUpdatedFlags);
  ExpectSlotsFrom(3, &IvltDynamicRegistrar::GetComponentsForBindingClass);
  ExpectSlotsFrom(3, &IvltDowngradeRegistrar::GetPreviousDictionaries,
                  &IvltDowngradeRegistrar::RemovePreviousDictionaries);
}

TEST(vltSlots, OfTheEnumerators) {
  using E = IvltEnumComponent;
  ExpectSlotsFrom(0, &E::QueryInterface, &E::AddRef, &E::Release, &E::Next, &E::Skip, &E::Reset,
                  &E::Clone);
  EXPECT_EQ(SlotOf(&CvltEnumComponentRegistrar::Clone), 6u);
  using T = IEnumString;
  ExpectSlotsFrom(0, &T::QueryInterface, &T::AddRef, &T::Release, &T::Next, &T::RemoteNext,
                  &T::Skip, &T::Reset, &T::Clone);
  using C = CEnumErrorString;
  ExpectSlotsFrom(0, &C::QueryInterface, &C::AddRef, &C::Release, &C::Next, &C::RemoteNext,
                  &C::Skip, &C::Reset, &C::Clone);
}

// Two slots after the interfaces are the destructor's. The side interfaces' operations have a place
// in the registrar's own table too.
template <class P>
void ExpectSlotsBehindTheInterfaces() {
  EXPECT_EQ(SlotOf(&P::SetSnapshotPath), 18u);
  ExpectSlotsFrom(21, &P::Scan, &P::ResetDDUpdatedFlags, &P::GetComponentsForBindingClass,
                  &P::GetPreviousDictionaries, &P::RemovePreviousDictionaries, &P::Duplicate,
                  &P::RegisterDataDictionary, &P::FindRegistrationFiles, &P::MergeRegistrationFile,
                  &P::UpdateRegistrationFile, &P::HasDDChanged, &P::RemoveDeletedComponents,
                  &P::RemoveComponentsIfFileDoesNotExist, &P::GetPrevDictsLastFolder,
                  &P::RegisterResourceExpert, &P::RegisterObjectExpert, &P::ReadComponent,
                  &P::PopulateBindingClasses);
  EXPECT_EQ(SlotOf(&P::ResetDDUpdatedFlags), 22u);
  EXPECT_EQ(SlotOf(&P::PopulateBindingClasses), 38u);
}

TEST(vltSlots, OfTheClassesBehindTheInterfaces) {
  EXPECT_EQ(SlotOf(&CvltRegistrar::Scan), 21u);
  ExpectSlotsBehindTheInterfaces<CvltPharlapRegistrar>();
  ExpectSlotsBehindTheInterfaces<CvltLinuxRegistrar>();
}

}  // namespace
}  // namespace vlt::test
