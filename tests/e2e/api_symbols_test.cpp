// The shared library as a host sees it: the C entry points are exported under their plain
// names, the library's internals are not.
#include <gtest/gtest.h>

#include <dlfcn.h>

#include <cstdio>
#include <string>

namespace {

class SharedLibrary : public ::testing::Test {
 protected:
  void SetUp() override {
    handle_ = dlopen(VIRADUVE_LIBRARY_PATH, RTLD_NOW | RTLD_LOCAL);
    ASSERT_NE(handle_, nullptr) << dlerror();
  }
  void TearDown() override {
    if (handle_) dlclose(handle_);
  }
  void* handle_ = nullptr;
};

// The dynamic symbol table of the library, as nm prints it.
std::string definedDynamicSymbols() {
  const std::string command =
      std::string("nm -D --defined-only '") + VIRADUVE_LIBRARY_PATH + "' 2>/dev/null";
  std::string text;
  if (FILE* pipe = popen(command.c_str(), "r")) {
    char buffer[4096];
    std::size_t n;
    while ((n = fread(buffer, 1, sizeof buffer, pipe)) > 0) text.append(buffer, n);
    pclose(pipe);
  }
  return text;
}

TEST_F(SharedLibrary, ExportsTheEntryPoints) {
  for (const char* name :
       {"getAutoAnalysisFrameDetection", "getBandLaneAnalysis", "getCustomAnalysisFrame",
        "getUpdateBandDetection", "getRollingBallOnAnalysedData", "getRegionAnalysis",
        "getTPNAnalysisData", "convertAndExportImage", "vitToTiff", "releaseResult"}) {
    EXPECT_NE(dlsym(handle_, name), nullptr) << name;
  }
}

TEST_F(SharedLibrary, HidesTheInternals) {
  // Mangled names of internal functions of the call frame, decoding and encoding.
  for (const char* name : {"_ZN8viraduve3api9parseJsonERKNSt7__cxx1112basic_stringIcSt11char_"
                           "traitsIcESaIcEEERN4Json5ValueEPKc",
                           "_ZN8viraduve3api7textArgB5cxx11EPKc", "_ZN8viraduve3api12kErrorAnswerE"}) {
    EXPECT_EQ(dlsym(handle_, name), nullptr) << name;
  }
  const std::string symbols = definedDynamicSymbols();
  ASSERT_NE(symbols.find(" getBandLaneAnalysis"), std::string::npos) << "nm gave:\n" << symbols;
  for (const char* internal :
       {"_ZN8viraduve3api", "instrument2cloudAnalysisObject", "encodeFrames", "decodeFrame",
        "applyChannelGeometry"}) {
    EXPECT_EQ(symbols.find(internal), std::string::npos) << internal;
  }
}

TEST_F(SharedLibrary, AnswersThroughTheLoadedSymbols) {
  using AutoFn = char* (*)(const char*, const char*, const char*, const char*);
  using ReleaseFn = void (*)(char*);
  auto autoAnalysis = reinterpret_cast<AutoFn>(dlsym(handle_, "getAutoAnalysisFrameDetection"));
  auto release = reinterpret_cast<ReleaseFn>(dlsym(handle_, "releaseResult"));
  ASSERT_TRUE(autoAnalysis && release);
  std::fflush(stdout);
  char* refused = autoAnalysis("/nonexistent", "Unknown", nullptr, "{}");
  EXPECT_EQ(refused, nullptr);
  release(refused);
}

}  // namespace
