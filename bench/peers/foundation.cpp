// Rows 6 to 10 and 13: digests, text, streams in memory.
#include <glib.h>
#include <openssl/evp.h>
#include <stdlib.h>
#include <string.h>
#include <wchar.h>

#include <memory>
#include <sstream>
#include <vector>

#include "bench/peers/Contest.h"
#include "bench/peers/Parts.h"
#include "source/Cmd5vlt.h"
#include "source/Common/ZtUtils/General/CztMemoryStream.h"
#include "source/Common/vltcmn.h"
#include "zt/fnd/Utf8ToWide.h"
#include "zt/fnd/WideToUtf8.h"
#include "zt/fnd/osdep/StringCompare.h"
#include "ztcom/ztcore/ztcom.h"

namespace peers {
namespace {

void RunMd5() {
  std::string data(16 << 20, 'x');
  unsigned char digest[16];
  Run({"6",
       "MD5 of 16 MiB",
       [&] {
         Cmd5vlt md5;
         md5.addString(reinterpret_cast<const unsigned char*>(data.data()),
                       static_cast<unsigned>(data.size()));
         md5.getDigest(digest);
       },
       {{"OpenSSL", 0.95, [&] { Md5(data); }}}});
}

void RunUtf8(const char* job, const std::wstring& piece, double aim) {
  std::wstring wide;
  while (wide.size() < 1024) wide += piece;
  std::vector<unsigned char> bytes(zt::fnd::GetUtf8EncodingBytes(wide.c_str()));
  zt::fnd::WideToUtf8(wide.data(), wide.data() + wide.size(), bytes.data(),
                      bytes.data() + bytes.size());
  while (bytes.size() < 4096) bytes.insert(bytes.end(), bytes.begin(), bytes.end());
  std::vector<wchar_t> out(bytes.size());
  Run({"8",
       job,
       [&] {
         zt::fnd::Utf8ToWide(bytes.data(), bytes.data() + bytes.size(), out.data(),
                             out.data() + out.size());
       },
       {{"mbsnrtowcs", aim,
         [&] {
           const char* begin = reinterpret_cast<const char*>(bytes.data());
           mbstate_t state = {};
           Require(mbsnrtowcs(out.data(), &begin, bytes.size(), out.size(), &state) !=
                       static_cast<size_t>(-1),
                   "mbsnrtowcs");
         }},
        {"memcpy of the bytes", 0, [&] {
           memcpy(out.data(), bytes.data(), bytes.size());
           asm volatile("" : : "r"(out.data()) : "memory");
         }}}});
}

// What malloc and memcpy cost behind an interface that a library exports: two calls that the compiler
// does not see through, a result, and the copy through a pointer.
[[gnu::noipa]] HRESULT DuplicateBehindACall(const wchar_t* text, wchar_t** copy) {
  const size_t bytes = (wcslen(text) + 1) * sizeof(wchar_t);
  *copy = static_cast<wchar_t*>(malloc(bytes));
  if (!*copy) return E_OUTOFMEMORY;
  memcpy(*copy, text, bytes);
  return S_OK;
}
[[gnu::noipa]] void FreeBehindACall(void* block) { free(block); }

void RunText() {
  RunUtf8("UTF-8 to wide, 4 KiB of ASCII", L"/Library/Frameworks/Example.vle/", 0.15);
  RunUtf8("UTF-8 to wide, 4 KiB mixed", L"path \xE9\x20AC\x1F600", 0.6);
  const wchar_t* text = L"twenty-four characters !";
  Run({"9",
       "copy of 24 wide characters, and free",
       [=] {
         wchar_t* copy = nullptr;
         Require(vltDuplicateString2(text, &copy) == S_OK, "vltDuplicateString2");
         vltTaskMemFree(copy);
       },
       {{"malloc and memcpy", 1.15,
         [=] {
           size_t bytes = (wcslen(text) + 1) * sizeof(wchar_t);
           void* copy = malloc(bytes);
           memcpy(copy, text, bytes);
           asm volatile("" : : "r"(copy) : "memory");
           free(copy);
         }},
        {"the same behind two calls", 0, [=] {
           wchar_t* copy = nullptr;
           Require(DuplicateBehindACall(text, &copy) == S_OK, "a copy");
           FreeBehindACall(copy);
         }}}});
  std::wstring a = L"/Library/Frameworks/Example Dictionary.framework/Resources/Info.vlr", b = a;
  for (size_t i = 0; i < b.size(); i += 2) b[i] = static_cast<wchar_t>(towupper(wint_t(b[i])));
  Run({"10",
       "caseless compare, mixed case",
       [&] { Require(zt::fnd::osdep::StringCaseCompare(a.c_str(), b.c_str()) == 0, "compare"); },
       {{"wcscasecmp", 0.15,
         [&] { Require(wcscasecmp(a.c_str(), b.c_str()) == 0, "their compare"); }}}});
}

// The least that a stream behind an interface does: a block that doubles, and a call that the
// compiler does not see through for each write.
class BareStream {
 public:
  virtual ~BareStream() { free(m_begin); }
  [[gnu::noipa]] virtual HRESULT Write(const void* buffer, unsigned count, unsigned* done) {
    if (m_size + count > m_capacity) grow();
    memcpy(m_begin + m_size, buffer, count);
    m_size += count;
    *done = count;
    return S_OK;
  }

 private:
  void grow() {
    m_capacity = m_capacity ? m_capacity * 2 : 64;
    m_begin = static_cast<unsigned char*>(realloc(m_begin, m_capacity));
    Require(m_begin != nullptr, "memory");
  }
  unsigned char* m_begin = nullptr;
  size_t m_size = 0, m_capacity = 0;
};

[[gnu::noipa]] std::unique_ptr<BareStream> MakeBareStream() {
  return std::make_unique<BareStream>();
}

void RunStreams() {
  constexpr int kWrites = 1000000;
  Run({"13",
       "memory stream, 4 bytes a million times",
       [] {
         auto stream = CztComPtr<CztMemoryStream>::Attach(CztMemoryStream::CreateStream());
         unsigned done = 0;
         for (int i = 0; i < kWrites; ++i) stream->Write(&i, sizeof i, &done);
       },
       {{"std::stringstream", 0.25,
         [] {
           std::stringstream stream;
           for (int i = 0; i < kWrites; ++i) {
             stream.write(reinterpret_cast<const char*>(&i), sizeof i);
           }
         }},
        {"a bare stream", 0,
         [] {
           auto stream = MakeBareStream();
           unsigned done = 0;
           for (int i = 0; i < kWrites; ++i) stream->Write(&i, sizeof i, &done);
         }},
        {"GByteArray", 0.25, [] {
           GByteArray* array = g_byte_array_new();
           for (int i = 0; i < kWrites; ++i) {
             g_byte_array_append(array, reinterpret_cast<const guint8*>(&i), sizeof i);
           }
           g_byte_array_free(array, TRUE);
         }}}});
}

}  // namespace

void RunFoundation() {
  RunMd5();
  RunText();
  RunStreams();
}

}  // namespace peers
