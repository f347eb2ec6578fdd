#include "source/Utilities/vltCheck.h"

#include <gtest/gtest.h>
#include <signal.h>
#include <string.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>
#include <functional>

#include "source/Common/vltcmn.h"
#include "source/Utilities/vltutils.h"
#include "source/vltRegistrar.h"
#include "tests/support/InChild.h"
#include "tests/support/Installation.h"

namespace {

using namespace vlt::test;

std::wstring Wide(const std::string& text) { return std::wstring(text.begin(), text.end()); }

std::vector<std::string> Texts(const vltErrors& errors) {
  std::vector<std::string> texts;
  for (unsigned i = 0; i < errors.size(); ++i) {
    texts.push_back(zt::fnd::AnsiString(const_cast<vltErrors&>(errors)[i]).c_str());
  }
  return texts;
}

using Messages = std::vector<std::string>;

// A real library that exports the entry; of this program's word size.
void MakeLibrary(const std::string& file, const std::string& entry, bool otherWordSize = false) {
  TempDir dir;
  WriteBytes(dir / "x.cpp", "extern \"C\" int " + entry + "() { return 0; }\n");
  bool is32 = (sizeof(void*) == 4) != otherWordSize;
  auto built = RunProgram(
      {"g++", is32 ? "-m32" : "-m64", "-shared", "-fPIC", "-nostdlib", "-o", file, dir / "x.cpp"});
  ASSERT_EQ(built.exitCode, 0) << built.err;
}

class vltCheck : public testing::Test {
 protected:
  HRESULT check(_vltComponentType type, const std::string& file, const wchar_t* prefix = nullptr,
                const std::string& aux = "") {
    std::wstring wideFile = Wide(file), wideAux = Wide(aux);
    std::wstring widePrefix = prefix ? prefix : L"";
    _vltComponent2 record;
    memset(&record, 0, sizeof record);
    record.type = type;
    if (!file.empty()) record.fileName = wideFile.data();
    if (type == vltComponentDataDictionary) {
      if (prefix) record.dictionary.prefix = widePrefix.data();
      if (!aux.empty()) record.dictionary.auxString1 = wideAux.data();
    }
    return CheckComponent(record, errors);
  }

  TempDir dir;
  vltErrors errors;
};

TEST_F(vltCheck, ADictionarysLastFileDecides) {
  WriteBytes(dir / "prefix", "");
  WriteBytes(dir / "aux", "");
  std::string missing = dir / "missing";
  EXPECT_EQ(check(vltComponentDataDictionary, missing, Wide(dir / "prefix").c_str(), dir / "aux"),
            S_OK);
  EXPECT_EQ(Texts(errors),
            Messages{"the dictionary \"" + missing + "\" is registered but does not exist"});
  EXPECT_EQ(check(vltComponentDataDictionary, dir / "aux", nullptr, missing), E_FAIL);
}

TEST_F(vltCheck, APrefixThatIsNoPathDoesNotExist) {
  EXPECT_EQ(check(vltComponentDataDictionary, "", L"vl"), E_FAIL);
  EXPECT_EQ(Texts(errors), Messages{"the dictionary \"vl\" is registered but does not exist"});
}

TEST_F(vltCheck, FilesBelowAFileAndDirectoriesDoNotExist) {
  WriteBytes(dir / "file", "");
  EXPECT_EQ(check(vltComponentDataDictionary, dir / "file/x"), E_FAIL);
  EXPECT_EQ(check(vltComponentDataDictionary, dir.path()), E_FAIL);
  EXPECT_EQ(errors.size(), 2u);
  EXPECT_NE(Texts(errors)[0].find("does not exist"), std::string::npos);
}

TEST_F(vltCheck, AnUnreadableFileIsTold) {
  if (geteuid() != 0) GTEST_SKIP() << "needs root, to have files of two users";
  WriteBytes(dir / "file", "");
  ASSERT_EQ(chmod((dir / "file").c_str(), 0600), 0);
  ASSERT_EQ(chmod(dir.path().c_str(), 0755), 0);
  EXPECT_EQ(Child([&] {
              if (setresuid(65534, 65534, 65534) != 0) return 9;
              if (check(vltComponentDataDictionary, dir / "file") != E_FAIL) return 1;
              return Texts(errors)[0] == "the dictionary \"" + (dir / "file") +
                                             "\" is registered but is not readable"
                         ? 0
                         : 2;
            }).wait(),
            0);
}

std::string NotReadable(const std::string& word, const std::string& file) {
  return "the " + word + " \"" + file + "\" is registered but is not readable";
}

TEST_F(vltCheck, APathThatCannotBeLookedAtIsNotReadable) {
  std::string circle = dir / "circle", tooLong = dir / std::string(300, 'x');
  std::filesystem::create_symlink(circle, circle);
  for (const std::string& file : {circle, tooLong}) {
    EXPECT_EQ(check(vltComponentDataDictionary, file), E_FAIL);
    EXPECT_EQ(check(vltComponentObjectExpert, file), E_FAIL);
    EXPECT_EQ(Texts(errors),
              (Messages{NotReadable("dictionary", file), NotReadable("object expert", file)}));
    errors = vltErrors();
  }
}

TEST_F(vltCheck, ADirectoryThatMayNotBeEnteredIsNotReadable) {
  if (geteuid() != 0) {
    printf("NOT TESTED: needs root, to have a directory of another user\n");
    GTEST_SKIP();
  }
  WriteBytes(dir.makeDir("locked") + "/file", "");
  ASSERT_EQ(chmod((dir / "locked").c_str(), 0700), 0);
  ASSERT_EQ(chmod(dir.path().c_str(), 0755), 0);
  EXPECT_EQ(Child([&] {
              if (setresuid(65534, 65534, 65534) != 0) return 99;
              if (check(vltComponentDataDictionary, dir / "locked/file") != E_FAIL) return 1;
              return Texts(errors) == Messages{NotReadable("dictionary", dir / "locked/file")} ? 0
                                                                                               : 2;
            }).wait(),
            0);
}

TEST_F(vltCheck, EntryPointsByType) {
  struct Row {
    _vltComponentType type;
    const char *word, *entry;
  };
  const Row rows[] = {{vltComponentObjectExpert, "object expert", "vltCreateObjectExpert"},
                      {vltComponentResourceExpert, "resource expert", "vltCreateResourceExpert"},
                      {vltComponentUIProvider, "UI provider", "vlGetProvider"}};
  for (const Row& row : rows) {
    std::string good = dir / "good.so", other = dir / "other.so", missing = dir / "missing.so";
    MakeLibrary(good, row.entry);
    MakeLibrary(other, "somethingElse");
    errors.clear();
    EXPECT_EQ(check(row.type, good), S_OK);
    EXPECT_EQ(check(row.type, other), E_FAIL);
    EXPECT_EQ(check(row.type, missing), E_FAIL);
    EXPECT_EQ(Texts(errors), (Messages{std::string("failed to find entry point \"") + row.entry +
                                           "\" in library \"" + other + "\"",
                                       std::string("the ") + row.word + " \"" + missing +
                                           "\" is registered but does not exist"}));
  }
}

TEST_F(vltCheck, WhatIsNoLibraryDoesNotLoad) {
  std::string text = dir / "text.so", foreign = dir / "foreign.so", needy = dir / "needy.so";
  WriteBytes(text, "no library");
  MakeLibrary(needy, "f(); int g() { return f(); } extern \"C\" int h");
  EXPECT_EQ(check(vltComponentObjectExpert, text), E_FAIL);
  EXPECT_EQ(check(vltComponentObjectExpert, needy), E_FAIL);
  for (unsigned i = 0; i < errors.size(); ++i) {
    EXPECT_EQ(Texts(errors)[i].rfind("failed to load library \"" + dir.path(), 0), 0u);
    EXPECT_TRUE(
        Texts(errors)[i].ends_with("\" while checking for entry point \"vltCreateObjectExpert\""));
  }
  EXPECT_EQ(errors.size(), 2u);
}

TEST_F(vltCheck, OtherTypesHaveNothingToCheck) {
  EXPECT_EQ(check(vltComponentType7, dir / "missing"), S_OK);
  EXPECT_EQ(check(vltComponentNone, dir / "missing"), S_OK);
  EXPECT_EQ(errors.size(), 0u);
}

TEST_F(vltCheck, AnExpertWithoutAFileIsTold) {
  EXPECT_EQ(check(vltComponentObjectExpert, ""), E_FAIL);
  EXPECT_EQ(Texts(errors), Messages{"the object expert \"\" is registered but does not exist"});
}

// ---- The export

Messages Drain(IEnumString* list) {
  Messages texts;
  wchar_t* text = nullptr;
  unsigned fetched = 0;
  while (list->Next(1, &text, &fetched) == S_OK) {
    texts.push_back(zt::fnd::AnsiString(text).c_str());
    vltFree(text);
  }
  return texts;
}

TEST_IN_CHILD(vltCheckExport, AllComponentsOfARealTree) {
  Installation installation;
  std::string good = installation.root() + "/good.so";
  MakeLibrary(good, "vltCreateObjectExpert");
  installation.addBundle("Experts", "a.vle",
                         "[KORComponents]\nGood=Good\n[Good]\nIdentifier="
                         "00000001-0000-0000-0000-000000000000\nFileName=" +
                             good + "\n");
  installation.addObjectExpert("b", "Bundle", "00000002-0000-0000-0000-000000000000");
  installation.addResourceExpert("c", "Ports", "00000003-0000-0000-0000-000000000000", "PNP");
  std::string root = installation.root();
  IEnumString* list = nullptr;
  ASSERT_EQ(vltCheckComponent(GUID_NULL, &list), E_FAIL);
  ASSERT_TRUE(list);
  Messages texts = Drain(list);
  list->Release();
  auto is = [](const std::string& word, const std::string& file) {
    return "the " + word + " \"" + file + "\" is registered but does not exist";
  };
  Messages expected = {is("dictionary", root + "/Data Dictionaries/vltdd.framework"),
                       is("dictionary", "vl"), is("object expert", root + "/Experts/b.vle"),
                       is("resource expert", root + "/Experts/c.vle")};
  EXPECT_EQ(texts, expected);
  GUID one = {1, 0, 0, {}};
  ASSERT_EQ(vltCheckComponent(one, &list), S_OK);
  EXPECT_TRUE(Drain(list).empty());
  list->Release();
}

TEST_IN_CHILD(vltCheckExport, AnUnknownIdFailsWithAnEmptyList) {
  Installation installation;
  IEnumString* list = nullptr;
  GUID unknown = {77, 0, 0, {}};
  ASSERT_EQ(vltCheckComponent(unknown, &list), E_INVALIDARG);
  ASSERT_TRUE(list);
  wchar_t* text = nullptr;
  unsigned fetched = 9;
  EXPECT_EQ(list->Next(1, &text, &fetched), S_FALSE);
  EXPECT_EQ(fetched, 0u);
  list->Release();
  EXPECT_EQ(vltCheckComponent(GUID_NULL, nullptr), E_POINTER);
}

TEST_IN_CHILD(vltCheckExport, ARegistrarWithoutComponentsHasNothingToTell) {
  Installation installation;
  WriteBytes(installation.sidecar(), "short");  // The database is given up: an empty registrar.
  IEnumString* list = nullptr;
  ASSERT_EQ(vltCheckComponent(GUID_NULL, &list), S_OK);
  ASSERT_TRUE(list);
  wchar_t* text = nullptr;
  unsigned fetched = 9;
  EXPECT_EQ(list->Next(1, &text, &fetched), S_FALSE);
  EXPECT_EQ(fetched, 0u);
  list->Release();
}

// ---- All components of a type

class FakeRegistrar : public CvltRegistrar {
 public:
  HRESULT Scan() override { return scanResult; }
  HRESULT GetSnapshotPath(wchar_t**) override { return E_NOTIMPL; }
  HRESULT SetSnapshotPath(const wchar_t*) override { return E_NOTIMPL; }
  HRESULT EnumComponents(_vltComponentType type, IvltEnumComponent** enumerator) override {
    return enumerates ? CvltRegistrar::EnumComponents(type, enumerator) : S_OK;
  }
  // A dictionary; they are walked in the order of their numbers.
  void add(uint32_t n, const std::string& file) {
    std::wstring name = L"name", wideFile = Wide(file);
    _vltComponent2 record;
    memset(&record, 0, sizeof record);
    record.type = vltComponentDataDictionary;
    record.name = name.data();
    record.identifier.Data1 = n;
    record.fileName = wideFile.data();
    ASSERT_EQ(RegisterComponent(&record), S_OK);
  }

  HRESULT scanResult = S_OK;
  bool enumerates = true;
};

class vltCheckType : public testing::Test {
 protected:
  vltCheckType() : registrar(new FakeRegistrar) { registrar->AddRef(); }
  ~vltCheckType() override { registrar->Release(); }
  HRESULT check() { return CheckComponents(registrar, vltComponentDataDictionary, errors); }

  TempDir dir;
  vltErrors errors;
  FakeRegistrar* registrar;
};

TEST_F(vltCheckType, AFailureIsKeptAndTheOthersAreCheckedAllTheSame) {
  WriteBytes(dir / "good", "");
  registrar->add(1, dir / "good");
  registrar->add(2, dir / "gone");
  registrar->add(3, dir / "gone too");
  registrar->add(4, dir / "good");
  EXPECT_EQ(check(), E_FAIL);
  auto missing = [&](const char* name) {
    return "the dictionary \"" + (dir / name) + "\" is registered but does not exist";
  };
  EXPECT_EQ(Texts(errors), (Messages{missing("gone"), missing("gone too")}));
}

TEST_F(vltCheckType, SoundComponentsAreASuccess) {
  EXPECT_EQ(check(), S_OK);
  WriteBytes(dir / "good", "");
  registrar->add(1, dir / "good");
  EXPECT_EQ(check(), S_OK);
  EXPECT_EQ(errors.size(), 0u);
}

TEST_F(vltCheckType, ARegistrarThatCannotEnumerateIsTheResult) {
  registrar->scanResult = E_OUTOFMEMORY;
  EXPECT_EQ(check(), E_OUTOFMEMORY);
  EXPECT_EQ(errors.size(), 0u);
}

TEST_F(vltCheckType, ASuccessWithoutAnEnumeratorEndsTheProcess) {
  registrar->enumerates = false;
  EXPECT_EQ(Child([&] {
              rlimit none = {};
              setrlimit(RLIMIT_CORE, &none);
              check();
              return 0;
            }).wait(),
            128 + SIGABRT);
}

// ---- The enumerator

class vltCheckErrorList : public testing::Test {
 protected:
  vltCheckErrorList() {
    vltErrors errors;
    for (const wchar_t* text : {L"a", L"b", L"c"}) errors.push_back(zt::fnd::String(text));
    list = new CEnumErrorString(errors);
    list->AddRef();
  }
  ~vltCheckErrorList() override { list->Release(); }
  CEnumErrorString* list;
};

TEST_F(vltCheckErrorList, NextHandsOutWhatThereIs) {
  wchar_t* texts[3] = {};
  unsigned fetched = 0;
  EXPECT_EQ(list->Next(2, texts, &fetched), S_OK);
  EXPECT_EQ(fetched, 2u);
  EXPECT_STREQ(texts[1], L"b");
  vltFree(texts[0]);
  vltFree(texts[1]);
  EXPECT_EQ(list->Next(2, texts, nullptr), S_FALSE);
  EXPECT_STREQ(texts[0], L"c");
  vltFree(texts[0]);
  EXPECT_EQ(list->Next(0, texts, &fetched), S_OK);
  EXPECT_EQ(fetched, 0u);
  EXPECT_EQ(list->Reset(), S_OK);
  EXPECT_EQ(Drain(list), (Messages{"a", "b", "c"}));
}

TEST_F(vltCheckErrorList, SkipMayGoPastTheEnd) {
  EXPECT_EQ(list->Skip(1), S_OK);
  EXPECT_EQ(Drain(list), (Messages{"b", "c"}));
  list->Reset();
  EXPECT_EQ(list->Skip(0xFFFFFFFF), S_OK);
  EXPECT_EQ(list->Skip(2), S_OK);
  EXPECT_TRUE(Drain(list).empty());
}

TEST_F(vltCheckErrorList, TheOtherOperations) {
  EXPECT_EQ(list->RemoteNext(1, nullptr, nullptr), E_NOTIMPL);
  IEnumString* clone = list;
  EXPECT_EQ(list->Clone(&clone), S_OK);
  EXPECT_EQ(clone, list);
  void* out = nullptr;
  for (const GUID& iid : {IID_IUnknown, IID_IEnumString}) {
    EXPECT_EQ(list->QueryInterface(iid, &out), S_OK);
    EXPECT_EQ(out, static_cast<IEnumString*>(list));
    EXPECT_EQ(list->Release(), 1u);
  }
  EXPECT_EQ(list->QueryInterface(IID_IvltRegistrar, &out), E_NOINTERFACE);
  EXPECT_EQ(out, nullptr);
}

}  // namespace
