// Lists the components by name, one a line; exits with 4 when the library raises InvalidArgument.
#include <vltutils/Exception.h>
#include <vltutils/OSException.h>
#include <vltutils/vltutils.h>

#include <cstdio>
#include <cstring>

namespace {

void List(IvltRegistrar* registrar, _vltComponentType type) {
  IvltEnumComponent* enumerator = nullptr;
  if (registrar->EnumComponents(type, &enumerator) < 0) return;
  for (;;) {
    _vltComponent2 record;
    std::memset(&record, 0, sizeof record);
    unsigned fetched = 0;
    if (enumerator->Next(1, &record, &fetched) != 0) break;
    wchar_t* guid = vltGuidToString(record.identifier);
    std::printf("%ls %ls\n", record.name, guid);
    vltFree(guid);
    vltutilsFreeComponent2(record);
  }
  enumerator->Release();
}

}  // namespace

int main() {
  try {
    IvltRegistrar* registrar = nullptr;
    if (vltGetRegistrar(&registrar) < 0) return 1;
    List(registrar, vltComponentDataDictionary);
    List(registrar, vltComponentObjectExpert);
    registrar->Release();
    return 0;
  } catch (const zt::fnd::osdep::OSException&) {
    return 3;
  } catch (const zt::fnd::exception::InvalidArgument& error) {
    std::printf("caught: %s\n", error.what());
    return 4;
  } catch (const zt::fnd::exception::Exception&) {
    return 5;
  }
}
