// Signposts before and after the library with the trace points is loaded. One
// case: what is loaded stays for the life of the process.

#include <dlfcn.h>
#include <gtest/gtest.h>

#include <cstdlib>
#include <string>

#include "client/talreporting.hpp"

namespace tal::test {
namespace {

TEST(Signposts, AreNothingUntilTheLibraryIsLoadedOnDemand) {
  talreporting_signpost_begin("org.vantle.audio", "before");
  ::setenv("TALREPORTING_SIGNPOST_LIBRARY", "/nowhere/at/all.so", 1);
  EXPECT_EQ(talreporting_signpost_enable(), TAL_OUT_OF_MEMORY);
  talreporting_signpost_end("org.vantle.audio", "before");

  ::setenv("TALREPORTING_SIGNPOST_LIBRARY", TAL_RECORDING_PROVIDER, 1);
  EXPECT_EQ(talreporting_signpost_enable(), TAL_OK);
  EXPECT_EQ(talreporting_signpost_enable(), TAL_OK);
  {
    const client::Signpost outer("org.vantle.audio", "decode");
    talreporting_signpost_begin("org.vantle.talsys", "mix");
    talreporting_signpost_end("org.vantle.talsys", "mix");
  }
  void* provider = ::dlopen(TAL_RECORDING_PROVIDER, RTLD_NOW | RTLD_NOLOAD);
  ASSERT_NE(provider, nullptr);
  const auto told = reinterpret_cast<const char* (*)()>(::dlsym(provider, "recording_provider_told"));
  ASSERT_NE(told, nullptr);
  EXPECT_STREQ(told(),
               "begin org.vantle.audio decode\nbegin org.vantle.talsys mix\n"
               "end org.vantle.talsys mix\nend org.vantle.audio decode\n");
  ::dlclose(provider);
}

}  // namespace
}  // namespace tal::test
