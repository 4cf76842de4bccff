// The program itself. What it answers over HTTPS, its start and stop, and its control file are
// covered by the end-to-end tests of the plug-in.
#include "sim/Files.h"
#include "host/Process.h"

#include <gtest/gtest.h>

namespace kyn::sim {
namespace {

constexpr const char* kToken = "s3cret-Token-41";

// A start-up error names the file and never shows the token, which travels in the environment.
TEST(ProgramTest, AMissingDataSetIsAStartupError) {
  host::TempDir dir;
  host::SpawnOptions options;
  options.captureOutput = true;
  options.errorFile = dir.path() / "stderr";
  options.environment = {std::string("KYN_SIM_TOKEN=") + kToken};
  options.endWithParent = true;
  host::Process run({KYN_SIM_BINARY, "--person", "1000000001", "--data", (dir.path() / "nothing.json").string()},
                    options);
  EXPECT_EQ(run.readAll(), "");
  EXPECT_EQ(run.wait(), 2);
  const std::string err = readFile(dir.path() / "stderr");
  EXPECT_NE(err.find("nothing.json"), std::string::npos) << err;
  EXPECT_EQ(err.find(kToken), std::string::npos);
}

}  // namespace
}  // namespace kyn::sim
