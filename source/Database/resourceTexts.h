#pragma once

#include <map>
#include <string>
#include <tuple>
#include <unordered_map>
#include <vector>

struct IniStructForwardReferenceTag;

namespace registrar {

// Takes what is wrong with a database, for those who want to know.
class ResourceObserver {
 public:
  // Whether each question is to repeat its reports, up to where it ends.
  virtual bool wantsAll() const = 0;
  virtual void noList() = 0;
  virtual void noSection(const char* section) = 0;
  virtual void noFileName(const char* section, int status) = 0;
  virtual void noText(const char* key, const char* section, int status) = 0;

 protected:
  ~ResourceObserver() = default;
};

// The texts of the components of a file, from one database: of all components that name a file of
// the same base name, whatever its case. Threads: one.
class ResourceTexts {
 public:
  // Takes the document, which was read without options. `observer` may be null.
  ResourceTexts(IniStructForwardReferenceTag* document, ResourceObserver* observer);
  ~ResourceTexts();
  ResourceTexts(const ResourceTexts&) = delete;
  ResourceTexts& operator=(const ResourceTexts&) = delete;

  // A document as the constructor takes it; null when out of memory.
  static IniStructForwardReferenceTag* NewDocument();

  struct Query {
    const char* separator;  // between the texts; null asks for the first component's only
    std::string target;     // base name of the component's file
    std::string key;
    unsigned maxLength;  // bytes of the answer
    std::string joined;  // the answer
    bool found = false;
    bool outOfMemory = false;  // the answer says nothing of the next time
  };
  void answer(Query& query);

  // What follows the last slash; empty without one.
  static std::string TargetOf(const std::string& file);

 private:
  bool fileNameOf(const char* section, std::string* base);
  bool appendFrom(Query& query, const char* section);
  void search(Query& query, const std::string& folded);
  const char* indexNext(std::string* folded);
  bool reports() const { return m_observer && m_observer->wantsAll(); }

  IniStructForwardReferenceTag* const m_document;
  ResourceObserver* const m_observer;
  int m_indexed = 0;  // items of the list that are in m_sectionsOf
  // Folded base name of a component's file to the sections that have it, in the order of the list.
  std::unordered_map<std::string, std::vector<std::string>> m_sectionsOf;

  // Answers given, by the file's folded base name below all else of a question: the components of one file all ask the same,
  // and each answer looks at all of them.
  struct Answer {
    bool found;
    std::string text;
  };
  using Kind = std::tuple<bool, std::string, std::string, unsigned>;
  std::map<Kind, std::unordered_map<std::string, Answer>> m_answers;
};

}  // namespace registrar
