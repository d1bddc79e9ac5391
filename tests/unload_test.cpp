// A program may load the library with a plug-in and unload the plug-in later.

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <json/value.h>

namespace {

TEST(UnloadTest, LeavesTheRowsReadable) {
  void* const plugin = dlopen(PLUGIN, RTLD_NOW | RTLD_LOCAL);
  ASSERT_NE(nullptr, plugin) << dlerror();
  const auto readRow = reinterpret_cast<void (*)(Json::Value*)>(dlsym(plugin, "readRow"));
  ASSERT_NE(nullptr, readRow) << dlerror();
  Json::Value rows;
  readRow(&rows);
  ASSERT_EQ(0, dlclose(plugin));
  ASSERT_EQ(1U, rows.size());
  EXPECT_THAT(rows[0U].getMemberNames(), testing::ElementsAre("id", "msg", "timestamp"));
  EXPECT_EQ("hello", rows[0U]["msg"].asString());
}

}  // namespace
