// A process that serves one request looks at central files less often.
#include "support/testing.h"
#include "vexo/process.h"
#include "vexo/settings.h"

namespace {

using RequestTest = ApplianceTest;

TEST_F(RequestTest, SeesWhatWasThereBeforeAndWhatItChangesItself) {
    SKIP_WITHOUT_ROOT();
    // What was written a moment ago is never remembered, so the file is made older.
    const auto write = [&](const char* text) {
        setSetting("greeting", text);
        const std::filesystem::path file = systemRoot() + "/etc/vexoinfo.conf";
        std::filesystem::last_write_time(file, std::filesystem::last_write_time(file) - std::chrono::hours(1));
    };
    write("first");
    EXPECT_EQ(support::inChild([&] {
                  const auto reads = [](const char* wanted) {  // from the file, then at a look, then without one
                      for (int i = 0; i < 3; ++i) {
                          if (VexoConf::Info().Get("greeting", "") != wanted) return false;
                      }
                      return true;
                  };
                  VEXORequestBegin();
                  if (!reads("first")) return 1;
                  write("second");  // by somebody else
                  VEXORequestBegin();
                  if (!reads("second")) return 2;
                  if (VLIBCFileSetKeyValue("/etc/vexoinfo.conf", "greeting", "third", "%s=\"%s\"\n") != 0) return 3;
                  return reads("third") ? 0 : 4;
              }),
              0);
}

}  // namespace
