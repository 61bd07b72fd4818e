// SPDX-License-Identifier: Apache-2.0
//
// The examples of the documentation, built and run, and the exports of the shared library.
#include <dlfcn.h>
#include <gtest/gtest.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <fstream>
#include <sstream>
#include <string>

#include "Tests/Client/FakeHelper.h"

namespace {

using fake::Bytes;

/// Runs an example against the helper's side of the wire and gives its exit code.
int RunExample(const char* program, const std::string& service) {
  std::array<char*, 3> arguments{const_cast<char*>(program), const_cast<char*>(service.c_str()),
                                 nullptr};
  pid_t child = 0;
  if (::posix_spawn(&child, program, nullptr, nullptr, arguments.data(), environ) != 0) return -1;
  int status = 0;
  while (::waitpid(child, &status, 0) < 0 && errno == EINTR) {
  }
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

class Example : public testing::TestWithParam<const char*> {};

TEST_P(Example, StoresAValueAndReadsItBack) {
  fake::Service service;
  std::string value;
  fake::Beside helper([&] {
    const fake::Connection connection = fake::Accept(service.socket());
    const int port = connection.privatePort.get();
    const Bytes set = fake::Receive(port).bytes;
    ASSERT_GE(set.size(), 568U);
    value.assign(set.begin() + 568, set.end());
    fake::Send(port, fake::PlainReply(0x848087, 0));
    EXPECT_EQ(fake::Receive(port).bytes.size(), 544U);
    fake::Send(port, fake::DataReply(0x848088, 0, 8) + fake::Text("<plist/>"));
    (void)fake::Receive(connection.clientPort.get());  // until the program has gone
  });
  EXPECT_EQ(RunExample(GetParam(), service.path()), 0);
  helper.join();
  EXPECT_EQ(value, "<plist><string>on</string></plist>");
}

TEST_P(Example, FailsWithoutTheService) {
  fake::Service service;
  service.close();
  EXPECT_GT(RunExample(GetParam(), service.path()), 0);
}

INSTANTIATE_TEST_SUITE_P(InC, Example, testing::Values(EXAMPLE_IN_C));
INSTANTIATE_TEST_SUITE_P(InCxx, Example, testing::Values(EXAMPLE_IN_CXX));

std::string Content(const std::string& path) {
  std::ifstream file(path);
  EXPECT_TRUE(file.good()) << path;
  std::ostringstream content;
  content << file.rdbuf();
  return content.str();
}

TEST(ClientDocumentation, HoldsTheExamplesThatAreBuilt) {
  const std::string page = Content(SOURCE_ROOT "/Documentation/client.md");
  for (const char* name : {"PreferenceExample.c", "PreferenceExample.cpp"}) {
    const std::string example = Content(SOURCE_ROOT "/Client/Examples/" + std::string(name));
    EXPECT_FALSE(example.empty());
    EXPECT_NE(page.find(example), std::string::npos) << name << " differs from the page";
  }
}

TEST(SharedLibrary, ExportsEveryFunctionOfVersionOneAndNoInternals) {
  void* library = ::dlopen(SHARED_LIBRARY, RTLD_NOW | RTLD_LOCAL);
  ASSERT_NE(library, nullptr) << SHARED_LIBRARY;
  for (const char* name : {"hvmh_abi_version",
                           "hvmh_status_text",
                           "hvmh_return_code_name",
                           "hvmh_error_describe",
                           "hvmh_options_init",
                           "hvmh_client_open",
                           "hvmh_client_close",
                           "hvmh_client_reconnect",
                           "hvmh_client_is_connected",
                           "hvmh_client_descriptor",
                           "hvmh_free",
                           "hvmh_set_voicemail_token",
                           "hvmh_set_voicemail_token_for_key",
                           "hvmh_clear_voicemail_token",
                           "hvmh_reset_voicemail_records",
                           "hvmh_copy_voicemail_token_for_key",
                           "hvmh_copy_voicemail_token",
                           "hvmh_set_preference_value",
                           "hvmh_copy_preference_value",
                           "hvmh_copy_app_preference_value",
                           "hvmh_set_carrier_bundle_link",
                           "hvmh_create_symlink",
                           "hvmh_remove_carrier_bundle_link",
                           "hvmh_is_voicemail_subscribed",
                           "hvmh_trigger_heartbeat",
                           "hvmh_trigger_database_update",
                           "hvmh_copy_file",
                           "hvmh_copy_crash_logs",
                           "hvmh_move_carrier_bundles",
                           "hvmh_request_country_code_from_location",
                           "hvmh_copy_country_code",
                           "hvmh_set_radio_manager_logging",
                           "hvmh_extract_archive",
                           "hvmh_copy_property_list_file"}) {
    EXPECT_NE(::dlvsym(library, name, "HVMH_1"), nullptr) << name;
  }
  EXPECT_EQ(::dlsym(library, "_ZN6halvec12HelperClient9reconnectEv"), nullptr);
  ::dlclose(library);
}

}  // namespace
