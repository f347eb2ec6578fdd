#pragma once

#include <functional>
#include <string>

#include "tests/e2e/Start.h"

// Registration files and installations as an enemy makes them. Each ends in its proper outcome, or
// with the component skipped: no crash, no hang, no lost database. What is beside the hostile
// file stays available.
namespace vlt::test {

inline constexpr uint32_t kGood = 0x600D;

// An installation with a component that must come through whatever else is in it.
class HostileInstallation : public Installation {
 public:
  HostileInstallation() { addDictionary("Good", "Good", GText(kGood), 3, "g"); }

  // The hostile file, with the good one twice around it.
  std::string plant(const std::string& bytes, const std::string& bundle = "Hostile.vle") {
    return addBundle("Experts", bundle, bytes);
  }

  // Two starts that work, with the good component in both; `body` looks at what came of it.
  void expectGood(const std::function<void(IvltRegistrar&)>& body = {},
                  int deadlineMs = kDeadlineMs) const {
    for (int start = 0; start < 2; ++start) {
      ExpectStart(
          "ok",
          [&](IvltRegistrar& r) {
            EXPECT_EQ(Find(r, G(kGood)), S_OK);
            EXPECT_EQ(Find(r, kVltdd), S_OK);
            if (body) body(r);
          },
          deadlineMs);
    }
    ExpectWhole(*this);
  }
};

inline std::string Component(const std::string& name, uint32_t guid,
                             const std::string& items = "") {
  return "[KORComponents]\n" + name + " = \"" + name + "\"\n[" + name + "]\nIdentifier = \"" +
         GText(guid) + "\"\n" + items;
}

}  // namespace vlt::test
