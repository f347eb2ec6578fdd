#pragma once

#include "source/Pharlap/vltPharlapRegistrar.h"

// The registrar that is really created: it adds the binding classes of experts, which come from the
// text "BINDING_CLASSES" of the database, joined over all components of one file.
class CvltLinuxRegistrar : public CvltPharlapRegistrar {
 public:
  // Runs Init; what it throws leaves nothing held, the database's lock included.
  CvltLinuxRegistrar(const zt::fnd::String& registrationFilePath,
                     const zt::fnd::String& installDirectory);

  // Stores the identifier with its braces, and the binding classes that are known for the record's
  // file name as it is given. Throws zt::fnd::exception::OutOfRange when the component's position
  // in the table of its file has no counterpart among its classes. The items before it stay set,
  // and go out with the next save.
  HRESULT RegisterResourceExpert(_vltComponent2* record) override;
  HRESULT RegisterObjectExpert(_vltComponent2* record) override;
  HRESULT ReadComponent(const wchar_t* section) override;
  // Enters the record's classes into the map of its type: S_OK, or E_FAIL if its file has no text.
  HRESULT PopulateBindingClasses(_vltComponent2* record) override;

 private:
  HRESULT writeBindingClasses(const std::string& section, const _vltComponent2* record);
  void addIfOwn(const _vltComponent2* record, const CvltBindingClasses& classes);
};
