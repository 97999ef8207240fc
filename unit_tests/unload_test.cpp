// A caller that loads the library by name, as a test application does, and lets it go.

#include <dlfcn.h>
#include <gtest/gtest.h>

TEST(Library, UnloadsWhenItIsClosed) {
  for (int round = 0; round < 2; ++round) {
    void* const library = dlopen(QVTESTER_LIBRARY, RTLD_NOW | RTLD_LOCAL);
    ASSERT_NE(nullptr, library) << dlerror();
    for (const char* name : {"_Z14InitTestModulev", "_Z18FinalizeTestModulev"}) {
      auto* const call = reinterpret_cast<int (*)()>(dlsym(library, name));
      ASSERT_NE(nullptr, call) << name;
      EXPECT_GE(call(), 0);
    }
    EXPECT_EQ(0, dlclose(library));
    EXPECT_EQ(nullptr, dlopen(QVTESTER_LIBRARY, RTLD_NOW | RTLD_NOLOAD)) << "still there";
  }
}
