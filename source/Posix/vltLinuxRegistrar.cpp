// Binding classes are the one thing that this class adds. They come from a text of the bundle's
// components ("BINDING_CLASSES"), parsed once a file and kept in m_bindingClassesByFile. Reading a
// component enters its classes into the map of its type; registering one writes them back, next to
// the expert's other items.
#include "source/Posix/vltLinuxRegistrar.h"

#include "source/Common/vltcmn.h"
#include "source/Pharlap/registrarText.h"
#include "zt/fnd/Exception.h"

using namespace registrar;
using zt::fnd::String;
using zt::fnd::Vector;

namespace {

// Bytes with the terminator; classes beyond it are cut off.
constexpr unsigned kLongestResource = 1024;

}  // namespace

CvltLinuxRegistrar::CvltLinuxRegistrar(const String& registrationFilePath,
                                       const String& installDirectory)
    : CvltPharlapRegistrar(registrationFilePath, installDirectory, false) {
  Init();  // Here, where virtual calls already reach this class.
}

HRESULT CvltLinuxRegistrar::ReadComponent(const wchar_t* section) {
  return ReadSection(section, EmptyFileName::IsNone);
}

HRESULT CvltLinuxRegistrar::writeBindingClasses(const std::string& section,
                                                const _vltComponent2* record) {
  auto found = m_bindingClassesByFile.find(String(record->fileName ? record->fileName : L""));
  HRESULT result = S_OK;
  if (found == m_bindingClassesByFile.end()) return result;
  Vector<GUID> components = found->second->GetComponentVector();
  for (unsigned k = 0; k < components.size(); ++k) {
    if (!(components[k] == record->identifier)) continue;
    Vector<GUID> classes;
    found->second->GetBindingClassesForComponent(record->identifier, classes);
    std::string text = Narrow(vlrGuidToString(record->identifier));
    text += ":" + std::to_string(classes.size());
    for (unsigned n = 0; n < classes.size(); ++n) {
      // By the component's index: files in the field hold entries written so.
      if (k >= classes.size()) ZT_RAISE(zt::fnd::exception::OutOfRange());
      text += ":" + Narrow(vlrGuidToString(classes[k]));
    }
    HRESULT set = database().SetItem(section.c_str(), kBindingClasses, text.c_str(), true);
    // The first failure counts; the items after it are tried all the same.
    if (result >= 0) result = set;
  }
  return result;
}

HRESULT CvltLinuxRegistrar::RegisterObjectExpert(_vltComponent2* record) {
  DatabaseHold hold(*this);
  if (BeginChange() < 0) return E_FAIL;
  std::string section;
  HRESULT result = WriteExpert(record, GuidText::WithBraces, &section);
  if (result >= 0) result = writeBindingClasses(section, record);
  return result < 0 ? result : SaveExpert(record);
}

HRESULT CvltLinuxRegistrar::RegisterResourceExpert(_vltComponent2* record) {
  return RegisterObjectExpert(record);  // The type in the record makes the difference.
}

void CvltLinuxRegistrar::addIfOwn(const _vltComponent2* record, const CvltBindingClasses& classes) {
  for (const GUID& component : classes.GetComponentVector()) {
    if (component == record->identifier) AddBindingClasses(record, classes);
  }
}

HRESULT CvltLinuxRegistrar::PopulateBindingClasses(_vltComponent2* record) {
  const wchar_t* file = record->fileName ? record->fileName : L"";
  if (!m_bindingClassesByFile.empty()) {
    auto found = m_bindingClassesByFile.find(String(file));
    if (found != m_bindingClassesByFile.end()) {
      addIfOwn(record, *found->second);
      return S_OK;
    }
  }
  // The text is asked for once a file and kept: all experts of one bundle share it.
  TaskMem<char> text;
  HRESULT result = m_resources.get(":", file, L"BINDING_CLASSES", text.out(), kLongestResource);
  // S_OK with no text, which the query gives for empty ones, is none either.
  if (result < 0 || !text || !*text.get()) return E_FAIL;
  auto& classes = m_bindingClassesByFile[String(file)];
  classes = std::make_unique<CvltBindingClasses>(String(text.get()));
  addIfOwn(record, *classes);
  return result;
}
