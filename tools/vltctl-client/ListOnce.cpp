#include "tools/vltctl-client/ListOnce.h"

#include <errno.h>
#include <stdio.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <csignal>

namespace vltctl {
namespace {

template <class T>
Json OrNull(const std::optional<T>& value) {
  return value ? Json(*value) : Json();
}

template <class T>
std::optional<T> OrNone(const Json& value) {
  if (value.is_null()) return std::nullopt;
  return value.get<T>();
}

Json Packed(const Component& c) {
  return {c.type,
          c.name,
          c.guid,
          c.file,
          c.fileIsExact,
          OrNull(c.schemaVersion),
          OrNull(c.fragmentRegistered),
          OrNull(c.lastInstalledSchemaVersion),
          OrNull(c.prefix),
          OrNull(c.pnp)};
}

Component Unpacked(const Json& row) {
  Component c;
  c.type = row[0];
  c.name = row[1];
  c.guid = row[2];
  c.file = row[3];
  c.fileIsExact = row[4];
  c.schemaVersion = OrNone<uint32_t>(row[5]);
  c.fragmentRegistered = OrNone<uint32_t>(row[6]);
  c.lastInstalledSchemaVersion = OrNone<uint32_t>(row[7]);
  c.prefix = OrNone<std::string>(row[8]);
  c.pnp = OrNone<std::string>(row[9]);
  return c;
}

// {"components": [...]}, or the failure.
Json Answer() {
  try {
    Json rows = Json::array();
    for (const Component& component : Client().list()) rows.push_back(Packed(component));
    return {{"components", rows}};
  } catch (const Failure& failure) {
    const Problem& p = failure.problem;
    return {{"exitCode", failure.code}, {"problem", {p.code, p.where, p.what, p.why, p.next}}};
  } catch (const std::exception& error) {
    // In the words of the library: files are not as they should be.
    return {{"exitCode", kDataUnusable}, {"problem", {"registrar", "", error.what(), "", ""}}};
  }
}

// Texts are bytes of any encoding, which CBOR takes as they are.
void Send(int fd) {
  std::vector<uint8_t> bytes = Json::to_cbor(Answer());
  for (size_t done = 0; done < bytes.size();) {
    ssize_t written = write(fd, bytes.data() + done, bytes.size() - done);
    if (written <= 0) return;
    done += static_cast<size_t>(written);
  }
}

std::vector<uint8_t> ReadAll(int fd) {
  std::vector<uint8_t> bytes;
  uint8_t block[65536];
  for (;;) {
    ssize_t got = read(fd, block, sizeof block);
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return bytes;
    bytes.insert(bytes.end(), block, block + got);
  }
}

std::vector<uint8_t> AskChild() {
  int ends[2];
  fflush(nullptr);
  pid_t parent = getpid(), child = pipe(ends) == 0 ? fork() : -1;
  if (child < 0) {
    throw Failure(kDataUnusable, {"no-process", "", "no process can be started", "", ""});
  }
  if (child == 0) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (getppid() == parent) Send(ends[1]);
    _exit(0);
  }
  close(ends[1]);
  std::vector<uint8_t> bytes = ReadAll(ends[0]);
  close(ends[0]);
  while (waitpid(child, nullptr, 0) < 0 && errno == EINTR) {
  }
  return bytes;
}

}  // namespace

std::vector<Component> ListOnce() {
  Json answer = Json::from_cbor(AskChild(), true, false);
  if (!answer.is_object()) {
    throw Failure(kDataUnusable, {"registrar", "", "the process that asked the registrar died", "",
                                  "\"vltctl verify\" shows the state of the database"});
  }
  if (answer.contains("problem")) {
    const Json& p = answer["problem"];
    throw Failure(static_cast<ExitCode>(answer["exitCode"].get<int>()),
                  {p[0], p[1], p[2], p[3], p[4]});
  }
  std::vector<Component> components;
  for (const Json& row : answer["components"]) components.push_back(Unpacked(row));
  return components;
}

}  // namespace vltctl
