#pragma once

#include <map>
#include <memory>
#include <string>

#include "source/Common/Posix/vltlinuxos.h"
#include "source/Common/vltBindingClasses.h"
#include "source/Database/recordText.h"
#include "source/Database/registrationFiles.h"
#include "source/GuardedIniFile.h"
#include "source/Pharlap/DatabaseSaves.h"
#include "source/vlIniMgr.h"
#include "source/vltRegistrar.h"
#include "zt/fnd/osdep/ForkSafeMutex.h"

namespace registrar {
class LiveScan;
}

// Keeps the components in one guarded INI file, the registration database, and in memory.
//
// Init opens the database, brings it up to date with the registration files of the installation,
// and reads every component into the map. After that no registration file is read again: Scan does
// nothing. The database's lock is held until the destructor, so a second process that wants a
// registrar waits for the first one's end.
//
// Each changed registration file is saved on its own, so that a start that is killed has done what
// it has done. The scan waits for the disk a few times in all (source/DurableCopy.h). Saves that a
// client asks for are durable each.
//
// The lock can be lost: by a fork, by a host that closes all descriptors, by a cleaner that removes
// the lock file. Every operation that changes the database makes sure of it first
// (CvlIniMgr::MakeSureOfLock) and fails with E_FAIL, nothing written, where another process has the
// database now. What is answered from memory is answered all the same.
//
// Threads: any after Init. m_iniLock orders the operations that use the database, and is taken
// before the map's lock.
class CvltPharlapRegistrar : public CvltRegistrar,
                             public IvltPharlapRegistrarEx,
                             public IvltDynamicRegistrar,
                             public IvltDowngradeRegistrar {
 public:
  using RegistrationFiles = registrar::RegistrationFiles;

  // `init` calls Init, with this class's operations. Subclasses pass false and call it themselves.
  CvltPharlapRegistrar(const zt::fnd::String& registrationFilePath,
                       const zt::fnd::String& installDirectory, bool init);

  HRESULT QueryInterface(const GUID& iid, void** out) override;
  uint32_t AddRef() override { return CvltRegistrar::AddRef(); }
  uint32_t Release() override { return CvltRegistrar::Release(); }

  // Path of the configuration; kKorDefaultDirectory + "/Data/config3.vlt" if none is set. A stored
  // bare "config3.vlt" lies in the data directory; without that directory the text comes with
  // E_FAIL.
  HRESULT GetConfigurationPath(wchar_t** path) override;
  HRESULT SetConfigurationPath(const wchar_t* path) override;
  HRESULT GetSDKPath(wchar_t**) override { return E_FAIL; }
  HRESULT SetSDKPath(const wchar_t*) override { return E_FAIL; }
  HRESULT GetSchemaVersion(unsigned int* version) override;
  HRESULT SetSchemaVersion(unsigned int version) override;
  HRESULT RegisterComponent(_vltComponent2* component) override;
  HRESULT UnregisterComponent(GUID) override { return E_FAIL; }
  HRESULT GetComponent(GUID identifier, _vltComponent2* component) override;
  HRESULT EnumComponents(_vltComponentType type, IvltEnumComponent** enumerator) override;
  HRESULT GetStorageServerCacheSize(unsigned int* sizeBytes) override;
  HRESULT SetStorageServerCacheSize(unsigned int sizeBytes) override;
  HRESULT GetStorageClientCacheSize(unsigned int*) override { return E_FAIL; }
  HRESULT SetStorageClientCacheSize(unsigned int) override { return E_FAIL; }
  HRESULT GetSnapshotPath(wchar_t**) override { return E_FAIL; }
  HRESULT SetSnapshotPath(const wchar_t*) override { return E_FAIL; }

  ~CvltPharlapRegistrar() override;
  HRESULT Scan() override { return S_OK; }

  // For the first use in a process that did not make the object: takes the database's lock again,
  // if no other process has it.
  void ContinueInThisProcess();

  // ---- After Scan, in the order of the dispatch table.
  HRESULT ResetDDUpdatedFlags() override;
  HRESULT GetComponentsForBindingClass(_vltComponentType type, GUID bindingClass,
                                       unsigned int* count, GUID** components) override;
  HRESULT GetPreviousDictionaries(const _vltStartupOptions* options, unsigned int* count,
                                  wchar_t*** paths) override;
  HRESULT RemovePreviousDictionaries(const _vltStartupOptions* options) override;
  // Copies a record with texts of its own; failed texts are null. S_OK.
  virtual HRESULT Duplicate(_vltComponent2* target, const _vltComponent2* source);
  // Writes the record's section, saves, and brings the copy in memory up to date, if there is one.
  virtual HRESULT RegisterDataDictionary(_vltComponent2* record);
  // Registration files of the bundles, dictionaries first, with the times of their last change.
  virtual HRESULT FindRegistrationFiles(RegistrationFiles& files);
  // Copies every section of the file into the database; does not save.
  virtual HRESULT MergeRegistrationFile(const zt::fnd::String& installDirectory, const char* file);
  virtual HRESULT UpdateRegistrationFile();
  // `changed` becomes true for every section of a dictionary, and false for the others.
  virtual HRESULT HasDDChanged(CvlIniMgr& fragment, const wchar_t* section, bool& changed);
  // Drops the components whose registration file is gone; does not save.
  virtual HRESULT RemoveDeletedComponents();
  virtual void RemoveComponentsIfFileDoesNotExist(char* section, char* file,
                                                  zt::fnd::Vector<zt::fnd::String>& eraseList,
                                                  int first, int last);
  // Full paths of the dictionaries in "Data Dictionaries/Last": S_OK, or S_FALSE if there are none.
  virtual HRESULT GetPrevDictsLastFolder(zt::fnd::Vector<zt::fnd::String>& names);
  virtual HRESULT RegisterResourceExpert(_vltComponent2* record);
  virtual HRESULT RegisterObjectExpert(_vltComponent2* record);
  // Makes a component of a section of the database and puts it into the map.
  virtual HRESULT ReadComponent(const wchar_t* section);
  virtual HRESULT PopulateBindingClasses(_vltComponent2*) { return S_OK; }

  // Cuts the braces of a 38-character GUID text: S_OK; S_FALSE for another length, E_FAIL for 38
  // characters without both braces, the text then untouched; E_POINTER.
  static HRESULT StripBracesFromGuid(char* text);
  static HRESULT StripBracesFromGuid(wchar_t* text);

 protected:
  using EmptyFileName = registrar::EmptyFileName;
  // What the sections of experts have in their database form.
  enum class GuidText { WithoutBraces, WithBraces };

  // Opens the database and fills the map. A database that cannot be used leaves both empty; what
  // the file system refuses, and what the second opening throws, passes.
  void Init();
  HRESULT ReadSection(const wchar_t* section, EmptyFileName emptyFileName);
  // Sets the items that every expert has, in the section *name. E_FAIL for a reserved name, or
  // where an item cannot be set; then nothing may be saved.
  HRESULT WriteExpert(const _vltComponent2* record, GuidText guidText, std::string* name);
  HRESULT SaveExpert(const _vltComponent2* record);
  void AddBindingClasses(const _vltComponent2* record, const CvltBindingClasses& classes);
  HRESULT SaveChanges();
  bool isOpen() const { return m_registrationIni != nullptr; }
  // S_OK if the database is open and the lock held: the change may be made. E_FAIL.
  HRESULT BeginChange();
  CvlIniMgr& database() { return *m_registrationIni; }

  // By exact comparison of the file's path, unlike the String's own.
  struct ExactLess {
    bool operator()(const zt::fnd::String& a, const zt::fnd::String& b) const {
      return a.exactCompare(b) < 0;
    }
  };
  std::map<zt::fnd::String, std::unique_ptr<CvltBindingClasses>, ExactLess> m_bindingClassesByFile;
  // Texts of the database as it is on the disk.
  vltStringResources m_resources;
  // Orders the operations that use the database.
  zt::fnd::osdep::ForkSafeMutex m_iniLock{zt::fnd::osdep::AtFork::Wait, 40};

  // Holds m_iniLock for a scope. In a child that was forked while another thread was inside, the
  // document may be half changed: it is read from the file again.
  class DatabaseHold {
   public:
    explicit DatabaseHold(CvltPharlapRegistrar& registrar);

   private:
    zt::fnd::osdep::ForkSafeHold m_hold;
  };

 private:
  HRESULT OpenIniWithValidation();
  void update();

  void initSettings();
  void registerBuiltInDictionary();
  void readComponents();
  HRESULT dataDirectory(zt::fnd::String* directory);
  HRESULT setAndSave(const char* key, const char* value, bool quote);
  HRESULT previousDictionariesFolder(zt::fnd::String* folder);
  bool completeFileName(const std::string& section, registrar::RecordText* text);

  // Filled while the components are read, and only read after that.
  BindingClassesMap m_resourceExpertBindings;
  BindingClassesMap m_objectExpertBindings;
  zt::fnd::String m_installDirectory;
  // The database: how it is opened and saved, and the open document, which holds its lock.
  GuardedIniFile m_file;
  std::unique_ptr<CvlIniMgr> m_registrationIni;
  std::unique_ptr<DatabaseSaves> m_saves;  // null where the opening failed
  class ScanHold;
  registrar::LiveScan* m_scan = nullptr;  // the one under way, if there is one
};
