// Starts the toolkit layer once for the whole test program, as a host would.
#include <gtest/gtest.h>

#include <ovraxmp/XMPToolkit.h>

namespace {

class ToolkitEnvironment : public ::testing::Environment {
 public:
  void SetUp() override {
    ovraxmp::XMPMeta::Initialize();
    ovraxmp::XMPFiles::Initialize("/nonexistent/plugins");
    ovraxmp::XMPMeta::SetClientName("ovraxmp tests");
  }
  void TearDown() override {
    ovraxmp::XMPFiles::Terminate();
    ovraxmp::XMPMeta::Terminate();
  }
};

const ::testing::Environment* const sEnvironment =
    ::testing::AddGlobalTestEnvironment(new ToolkitEnvironment);

}  // namespace
