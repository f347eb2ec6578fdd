// Sub-streams after any bytes: of owned and of read-only memory, of files, at any depth; copied, and
// written again in both byte orders. Whatever the bytes are, those that do not load are left as they
// were.
//
// The first byte says what is done; with its bit 0, a trailer that leads to the next two bytes' offset
// is put after the rest.
#include <map>

#include "fuzz/Bytes.h"
#include "fuzz/Place.h"
#include "ztcom/ztcore/ztmemmgr.h"

namespace {

constexpr uint8_t kWithTrailer = 1, kAlsoInFiles = 2, kReversed = 4;

// What a stream holds.
struct Tree {
  std::string contents;
  std::map<std::wstring, Tree> children;
  bool operator==(const Tree&) const = default;

  size_t depth() const {
    size_t deepest = 0;
    for (const auto& [name, child] : children) deepest = std::max(deepest, child.depth());
    return deepest + 1;
  }
};

Tree TreeOf(IztStream* stream);

std::map<std::wstring, Tree> ChildrenOf(IztStream2* stream) {
  std::map<std::wstring, Tree> children;
  wchar_t** names = nullptr;
  unsigned int count = 99, told = 98;
  fuzz::Demand(stream->GetSubStreamInfo(&names, &count) == S_OK);
  fuzz::Demand(stream->NumSubStreams(&told) == S_OK && told == count);
  for (unsigned int i = 0; i < count; ++i) {
    CztComPtr<IztStream> child;
    fuzz::Demand(stream->OpenSubStream(names[i], child.out()) == S_OK && child);
    children[names[i]] = TreeOf(child.get());
    ZtSysFreeString(names[i]);
  }
  ZtTaskMemFree(names);
  fuzz::Demand(children.size() == count);
  return children;
}

Tree TreeOf(IztStream* stream) {
  auto streams =
      CztComPtr<IztStream2>::Attach(ZtTryQueryInterface<IztStream2>(IID_IztStream2, stream));
  fuzz::Demand(static_cast<bool>(streams));
  Tree tree;
  tree.children = ChildrenOf(streams.get());
  fuzz::Demand(streams->ResetStreams() == S_OK && fuzz::Position(stream) == 0);
  tree.contents = fuzz::Contents(stream);
  return tree;
}

std::string MarkerBytes() {
  const GUID& marker = CztStreamBaseImp::s_SubStreamMarker;
  return std::string(reinterpret_cast<const char*>(&marker), sizeof marker);
}

std::string Trailer(int64_t offset) { return MarkerBytes() + fuzz::InOrder(offset, 0); }

// Data that would be taken for an area's end if it were alone.
bool EndsInMarker(const std::string& bytes) {
  return bytes.size() >= 24 && bytes.compare(bytes.size() - 24, 16, MarkerBytes()) == 0;
}

// The tree's bytes, with lengths in the width of those that readers ask for.
std::string Encoded(const Tree& tree, uint8_t order) {
  if (tree.children.empty() && !EndsInMarker(tree.contents)) return tree.contents;
  std::string area = fuzz::Header(order, 1, 0, 0) +
                     fuzz::InOrder(static_cast<int32_t>(tree.children.size()), order);
  for (const auto& [name, child] : tree.children) {
    std::string data = Encoded(child, order);
    area += fuzz::InOrder(static_cast<unsigned long>(name.size()), order);
    area.append(reinterpret_cast<const char*>(name.data()), name.size() * sizeof(wchar_t));
    area += fuzz::InOrder(static_cast<int32_t>(data.size()), order) + data;
  }
  return tree.contents + area + Trailer(static_cast<int64_t>(tree.contents.size()));
}

// True if the sub-streams load; `tree` is then what there is.
bool LoadsOwned(const std::string& bytes, Tree* tree) {
  auto* block = static_cast<unsigned char*>(malloc(bytes.size() + 1));
  memcpy(block, bytes.data(), bytes.size());
  fuzz::MemoryPtr stream = fuzz::NewMemory();
  try {
    fuzz::Demand(stream->AttachBuffer(block, bytes.size(), false) == S_OK);
  } catch (const CztStreamException&) {
    fuzz::Demand(ChildrenOf(stream.get()).empty());
    fuzz::Demand(fuzz::Contents(stream.get()) == bytes);
    return false;
  }
  *tree = TreeOf(stream.get());
  return true;
}

bool LoadsReadOnly(const std::string& bytes, const Tree& owned) {
  std::string copy = bytes;
  fuzz::MemoryPtr stream = fuzz::NewMemory();
  bool loads = true;
  try {
    stream->AttachBuffer(reinterpret_cast<unsigned char*>(copy.data()), copy.size(), true);
    fuzz::Demand(ChildrenOf(stream.get()) == owned.children);
  } catch (const CztStreamException&) {
    loads = false;
  }
  fuzz::Demand(fuzz::Contents(stream.get()) == bytes && copy == bytes);
  fuzz::Demand(stream->SetSize(1) == E_FAIL);
  return loads;
}

// In a file, opened for reading and then for writing too. Closing writes the data in front of the area
// as it was.
bool LoadsFromFile(const std::string& bytes, const Tree& owned) {
  static fuzz::Place place;
  std::string file = place / "stream";
  fuzz::WriteFile(file, bytes);
  bool loads = true;
  for (bool write : {false, true}) {
    try {
      auto stream = CztComPtr<CztFileStream>::Attach(
          CztFileStream::CreateStream(zt::fnd::String(file.c_str()), false, true, write));
      fuzz::Demand(static_cast<bool>(stream));
      fuzz::Demand(ChildrenOf(stream.get()) == owned.children);
      fuzz::Demand(fuzz::Contents(stream.get()) == (write ? owned.contents : bytes));
    } catch (const CztStreamException&) {
      loads = false;
    }
    if (!write || !loads) fuzz::Demand(fuzz::ReadFile(file) == bytes);
  }
  if (loads) fuzz::Demand(fuzz::ReadFile(file).starts_with(owned.contents));
  return loads;
}

void CopyAndWrite(const Tree& tree, uint8_t order) {
  if (tree.depth() > CztStreamBaseImp::kDeepestArea) return;  // an area more would be too deep
  std::string bytes = Encoded(tree, order);
  Tree again;
  fuzz::Demand(LoadsOwned(bytes, &again) && again == tree);
  fuzz::MemoryPtr source = fuzz::NewMemory(), target = fuzz::NewMemory();
  auto* block = static_cast<unsigned char*>(malloc(bytes.size() + 1));
  memcpy(block, bytes.data(), bytes.size());
  source->AttachBuffer(block, bytes.size(), false);
  fuzz::Demand(source->Clone(target.get()) == S_OK);
  fuzz::Demand(TreeOf(target.get()) == tree);
  fuzz::Demand(target->WriteSubStreamInfo() == S_OK);
  std::string written = fuzz::Contents(target.get());
  fuzz::Demand(written.starts_with(tree.contents));
  if (!tree.children.empty()) fuzz::Demand(EndsInMarker(written));
  if (sizeof(unsigned long) == 4 && !tree.children.empty()) {
    // Data that ends in a marker of its own is an area when it is alone, so leaves may differ.
    fuzz::Demand(LoadsOwned(written, &again) && again.children.size() == tree.children.size());
  }
  free(target->DetachBuffer());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t sizeBytes) {
  fuzz::Cursor input(data, sizeBytes);
  uint8_t what = input.byte();
  uint16_t offset = what & kWithTrailer ? input.number<uint16_t>() : 0;
  std::string bytes = input.rest();
  if (what & kWithTrailer) bytes += Trailer(offset);
  Tree tree;
  bool loads = LoadsOwned(bytes, &tree);
  fuzz::Demand(LoadsReadOnly(bytes, tree) == loads);
  if (what & kAlsoInFiles) fuzz::Demand(LoadsFromFile(bytes, tree) == loads);
  if (loads) CopyAndWrite(tree, what & kReversed ? 1 : 0);
  return 0;
}
