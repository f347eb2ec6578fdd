// A value becomes text in two steps: the attribute's type is asked of the object's class, and the
// type selects the getter and the conversion. Arrays differ in their element only, so that they are
// one template over kinds of elements; each kind says how to get the elements, how to print one and
// how to give one back.
//
// The storage is another module, of which each answer is a risk: it may throw, write something and
// fail, or report more than it has. So every reference and text is owned from the line after it
// came, and counts are cut to the space that was made.
#include "source/Common/vltAttributeValues.h"

#include <algorithm>
#include <cstdlib>

#include "source/Common/vltFailure.h"
#include "source/Common/vltHookPoints.h"
#include "source/Common/vltTestHook.h"
#include "source/Common/vltcmn.h"
#include "ztcom/ztcore/ztcom.h"

namespace {

using zt::fnd::String;

template <class T>
using ValueGetter = HRESULT (IvltObject::*)(vltAttributeID, T*);
template <class T>
using ArrayGetter = HRESULT (IvltObject::*)(vltAttributeID, uint32_t capacity, T* buffer,
                                            uint32_t* count);

// A step that returns an interface. A failed one returns no reference, whatever it wrote.
template <class I, class Step>
HRESULT Obtain(CztComPtr<I>* out, Step step) {
  I* found = nullptr;
  HRESULT result = step(&found);
  if (result < 0) return result;
  // The storage broke its contract, and nothing that it says can be relied upon.
  if (!found) abort();
  *out = CztComPtr<I>::Attach(found);
  return result;
}

GUID IdentityOf(IvltObject* object) {
  GUID id = GUID_NULL;
  // The result is dropped: an object without an id prints as the null GUID.
  object->GetObjectID(&id);
  return id;
}

// ---- Array elements. Each appends its text and gives back what the storage returned.

void AppendText(String& text, wchar_t* element) {
  TaskMem<wchar_t> owned(element);
  text += owned.get();  // null, when memory is out, is empty
}

template <class T, ArrayGetter<T> Getter, wchar_t* (*ToText)(T)>
struct PlainElements {
  using Element = T;
  static constexpr ArrayGetter<T> kGet = Getter;
  static void Append(String& text, T& element) { AppendText(text, ToText(element)); }
  static void Release(T&) {}
};

using I32Elements = PlainElements<int32_t, &IvltObject::GetI32ArrayAttribute, &vltI32ToString2>;
using U32Elements = PlainElements<uint32_t, &IvltObject::GetU32ArrayAttribute, &vltU32ToString2>;
using F64Elements = PlainElements<double, &IvltObject::GetF64ArrayAttribute, &vltF64ToString2>;
using GuidElements = PlainElements<GUID, &IvltObject::GetGuidArrayAttribute, &vltGuidToString2>;

struct StringElements {
  using Element = wchar_t*;
  static constexpr ArrayGetter<Element> kGet = &IvltObject::GetStringArrayAttribute;
  static void Append(String& text, Element& element) { text += element; }  // null is empty
  static void Release(Element& element) {
    vltTaskMemFree(element);
    element = nullptr;
  }
};

struct ReferenceElements {
  using Element = IvltObject*;
  static constexpr ArrayGetter<Element> kGet = &IvltObject::GetReferenceArrayAttribute;
  static void Append(String& text, Element& element) {
    if (!element) {
      text += L"NULL";
      return;
    }
    AppendText(text, vltGuidToString2(IdentityOf(element)));
  }
  static void Release(Element& element) {
    if (element) element->Release();
    element = nullptr;
  }
};

// Zeroed space for the elements, which are given back with it. Pages that the storage does not fill
// cost nothing, so that a count that is not true does no harm.
template <class Kind>
class ElementBuffer {
 public:
  using Element = typename Kind::Element;

  explicit ElementBuffer(uint32_t capacity)
      : m_elements(static_cast<Element*>(calloc(capacity, sizeof(Element)))),
        m_capacity(capacity) {}
  ~ElementBuffer() {
    for (uint32_t i = 0; i < m_count; ++i) Kind::Release(m_elements[i]);
    free(m_elements);
  }
  ElementBuffer(const ElementBuffer&) = delete;
  ElementBuffer& operator=(const ElementBuffer&) = delete;

  explicit operator bool() const { return m_elements != nullptr; }
  HRESULT fill(IvltObject* object, unsigned id) {
    uint32_t count = m_capacity;
    HRESULT result = (object->*Kind::kGet)(id, m_capacity, m_elements, &count);
    // A storage that sets no count is taken to have filled the space; a number beyond the space is
    // not believed.
    m_count = std::min(count, m_capacity);
    return result;
  }
  Element* begin() { return m_elements; }
  Element* end() { return m_elements + m_count; }

 private:
  Element* m_elements;
  uint32_t m_capacity;
  uint32_t m_count = 0;
};

HRESULT ReportOutOfMemory() {
  return vltReportOutOfMemory(
      "HRESULT vltGetArrayValueAsString(IvltObject*, vltAttributeID, vltAttributeType, "
      "zt::fnd::String&)");
}

// Elements go back as soon as they are written.
template <class Kind>
void AppendElements(ElementBuffer<Kind>& buffer, String& text) {
  for (auto& element : buffer) {
    if (&element != buffer.begin()) text += L',';
    Kind::Append(text, element);
    Kind::Release(element);
  }
}

template <class Kind>
HRESULT AppendArray(IvltObject* object, unsigned id, const char* hookPoint, String& text) {
  uint32_t count = 0;
  HRESULT result = (object->*Kind::kGet)(id, 0, nullptr, &count);
  // Asked for with a null buffer first. The array may change until the second call, which gets its
  // own count.
  if (result >= 0 && count > 0) {
    if (vlt::hook::Strikes(hookPoint)) return ReportOutOfMemory();
    ElementBuffer<Kind> buffer(count);
    if (!buffer) return ReportOutOfMemory();
    result = buffer.fill(object, id);
    AppendElements(buffer, text);
  }
  text += L'}';
  return result;
}

// ---- Single values

template <class T>
HRESULT ValueText(IvltObject* object, unsigned id, ValueGetter<T> get, wchar_t* (*toText)(T),
                  wchar_t** text) {
  T value{};
  HRESULT result = (object->*get)(id, &value);
  if (result >= 0) *text = toText(value);
  return result;
}

HRESULT StringText(IvltObject* object, unsigned id, wchar_t** text) {
  wchar_t* value = nullptr;
  HRESULT result = object->GetStringAttribute(id, &value);
  if (result < 0) return result;
  TaskMem<wchar_t> owned(value);
  *text = Dup(value);
  return result;
}

HRESULT ReferenceText(IvltObject* object, unsigned id, wchar_t** text) {
  IvltObject* found = nullptr;
  HRESULT result = object->GetReferenceAttribute(id, &found);
  // A failed getter returns no reference, and must not be released.
  if (result < 0) found = nullptr;
  auto owned = CztComPtr<IvltObject>::Attach(found);
  *text = vltGuidToString2(found ? IdentityOf(found) : GUID_NULL);
  return result;
}

HRESULT ArrayText(IvltObject* object, unsigned id, _vltAttributeType type, wchar_t** text) {
  String list;
  HRESULT result = vltGetArrayValueAsString(object, id, type, list);
  *text = Dup(list.c_str());
  return result;
}

}  // namespace

HRESULT vltGetAttributeType(IvltObject* object, unsigned id, _vltAttributeType* type) {
  if (!object || !type) return E_POINTER;
  CztComPtr<IvltClass> itsClass;
  HRESULT result = Obtain(&itsClass, [&](IvltClass** out) { return object->GetClass(out); });
  if (result < 0) return result;
  CztComPtr<IvltMetaAttribute> attribute;
  result = Obtain(&attribute,
                  [&](IvltMetaAttribute** out) { return itsClass->GetMetaAttribute(id, out); });
  return result < 0 ? result : attribute->GetAttributeType(type);
}

HRESULT vltSetAttributeValueFromString2(IvltObject* object, unsigned id, const wchar_t* text) {
  _vltAttributeType type = vltUnspecifiedType;
  HRESULT result = vltGetAttributeType(object, id, &type);
  if (result < 0) return result;
  switch (type) {
    case vltI32Type:
      return object->SetI32Attribute(id, vltI32FromString2(text));
    case vltU32Type:
      return object->SetU32Attribute(id, vltU32FromString2(text));
    case vltF64Type:
      return object->SetF64Attribute(id, vltF64FromString2(text));
    case vltStringType:
      return object->SetStringAttribute(id, text);
    case vltGuidType:
      return object->SetGuidAttribute(id, vltGuidFromString2(text));
    default:
      return E_FAIL;
  }
}

HRESULT vltGetAttributeValueAsString2(IvltObject* object, unsigned id, wchar_t** text) {
  if (!text) return E_POINTER;
  _vltAttributeType type = vltUnspecifiedType;
  HRESULT result = vltGetAttributeType(object, id, &type);
  if (result < 0) return result;
  switch (type) {
    case vltI32Type:
      return ValueText(object, id, &IvltObject::GetI32Attribute, &vltI32ToString2, text);
    case vltU32Type:
      return ValueText(object, id, &IvltObject::GetU32Attribute, &vltU32ToString2, text);
    case vltF64Type:
      return ValueText(object, id, &IvltObject::GetF64Attribute, &vltF64ToString2, text);
    case vltGuidType:
      return ValueText(object, id, &IvltObject::GetGuidAttribute, &vltGuidToString2, text);
    case vltStringType:
      return StringText(object, id, text);
    case vltReferenceType:
      return ReferenceText(object, id, text);
    case vltI32ArrayType:
    case vltU32ArrayType:
    case vltF64ArrayType:
    case vltStringArrayType:
    case vltReferenceArrayType:
    case vltGuidArrayType:
      return ArrayText(object, id, type, text);
    default:
      return E_FAIL;
  }
}

HRESULT vltGetAttributeValueAsStringImpl(IvltObject* object, unsigned id, wchar_t** text) {
  if (!text) return E_POINTER;
  // An own pointer in between: the inner function writes some texts also with a failure, which this
  // one promises not to.
  TaskMem<wchar_t> made;
  HRESULT result = vltGetAttributeValueAsString2(object, id, made.out());
  if (result >= 0) *text = made.release();
  return result;
}

HRESULT vltGetArrayValueAsString(IvltObject* object, unsigned id, _vltAttributeType type,
                                 String& text) {
  if (!object) return E_POINTER;
  text = L"{";
  switch (type) {
    case vltI32ArrayType:
      return AppendArray<I32Elements>(object, id, vlt::hook::kArrayI32, text);
    case vltU32ArrayType:
      return AppendArray<U32Elements>(object, id, vlt::hook::kArrayU32, text);
    case vltF64ArrayType:
      return AppendArray<F64Elements>(object, id, vlt::hook::kArrayF64, text);
    case vltGuidArrayType:
      return AppendArray<GuidElements>(object, id, vlt::hook::kArrayGuid, text);
    case vltStringArrayType:
      return AppendArray<StringElements>(object, id, vlt::hook::kArrayString, text);
    case vltReferenceArrayType:
      return AppendArray<ReferenceElements>(object, id, vlt::hook::kArrayReference, text);
    default:
      text += L'}';
      return E_FAIL;
  }
}
