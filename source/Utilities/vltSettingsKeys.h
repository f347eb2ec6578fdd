#pragma once

// Items of the settings file and what holds without them.
namespace settings {

inline constexpr const char* kSection = "STORAGE";

// The one index that has defaults.
inline constexpr unsigned kDefaultIndex = 3;

// An item whose name ends in the index in decimal digits, "LocalServerEndpoint3". The text at index
// 3 is what a plain installation uses.
struct IndexedText {
  const char* key;
  const wchar_t* atDefaultIndex;
};
inline constexpr IndexedText kBootstrapEndpoint = {"BootstrapEndpoint", L"62602"};
inline constexpr IndexedText kRemoteProtocol = {"RemoteServerProtocol", L"ncacn_ip_tcp"};
inline constexpr IndexedText kRemoteEndpoint = {"RemoteServerEndpoint", L"51700"};
inline constexpr IndexedText kRemoteEventPort = {"RemoteEventPort", L"57616"};
inline constexpr IndexedText kLocalProtocol = {"LocalServerProtocol", L"ncalrpc"};
inline constexpr IndexedText kLocalEndpoint = {"LocalServerEndpoint", L"61900"};
inline constexpr const char* kRemoteServerEnabled = "RemoteServerEnabled";  // 0 at every index
inline constexpr const char* kEventNameAppend = "EventNameAppend";          // empty at every index

// An item without an index, with its value where the item is missing. Units: limits in bytes, but
// for that of objects, which is a count; percentages; the collector's interval in milliseconds; the
// backup's in seconds.
struct PlainNumber {
  const char* key;
  long fallback;
};
inline constexpr PlainNumber kObjectCacheLimit = {"ClientObjectCacheLimit", 150000};
inline constexpr PlainNumber kObjectCacheFlushPercentage = {"ClientObjectCacheFlushPercentage", 20};
inline constexpr PlainNumber kBufferCacheLimit = {"ClientBufferCacheLimit", 0x2000000};
inline constexpr PlainNumber kBufferCacheMinimumLimit = {"ClientBufferCacheMinimumLimit", 0x200000};
inline constexpr PlainNumber kBufferCacheFlushPercentage = {"ClientBufferCacheFlushPercentage", 20};
inline constexpr PlainNumber kGarbageCollectorInterval = {"GarbageCollectorInterval", 20000};
inline constexpr PlainNumber kJournalingOptions = {"JournalingOptions", 1};
inline constexpr PlainNumber kMaxBackupFrequency = {"MaxBackupFrequency", 86400};
inline constexpr PlainNumber kValidateDBStructure = {"ValidateDBStructure", 1};
inline constexpr PlainNumber kNumCheckpoints = {"NumCheckpoints", 100};
inline constexpr PlainNumber kCreateCheckpoints = {"CreateCheckpoints", 1};

}  // namespace settings
