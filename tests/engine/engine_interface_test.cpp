// SPDX-License-Identifier: MIT
// The exported engine functions: results, life of an engine, version.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstdio>
#include <cstring>
#include <filesystem>
#include <iterator>
#include <string>
#include <type_traits>
#include <vector>

#include "core/model_tables.h"
#include "engine/engine_testing.h"
#include "norvale_face_shape_imp.h"

namespace n3ds::testing {
namespace {

Points FrontalFace(int count = 101) {
  return ToPoints(DetectLandmarks(ModelShape(), HeadPlace{}, 640, 480, count));
}

MRESULT InitializeEx(const Engine& engine, const std::vector<uint8_t>& bytes) {
  return Norvale_3DSticker_InitializeEx(engine.handle(), bytes.data(),
                                        static_cast<uint32_t>(bytes.size()), 0, 0);
}

bool IsReady(const Engine& engine) {
  RigidOutput out(101);
  const MRESULT result = Process(engine, ImageOf(640, 480), FrontalFace(), 101, &out);
  EXPECT_TRUE(result == N3DS_OK || result == N3DS_NOT_INITIALIZED) << result;
  return result == N3DS_OK;
}

// A file of the test's own.
class File {
 public:
  explicit File(const std::vector<uint8_t>& bytes) : path_(::testing::TempDir() + Name()) {
    std::FILE* file = std::fopen(path_.c_str(), "wb");
    EXPECT_NE(file, nullptr);
    if (!bytes.empty()) {
      EXPECT_EQ(std::fwrite(bytes.data(), 1, bytes.size(), file), bytes.size());
    }
    std::fclose(file);
  }
  ~File() { std::remove(path_.c_str()); }
  File(const File&) = delete;
  File& operator=(const File&) = delete;
  const char* path() const { return path_.c_str(); }

 private:
  static std::string Name() {
    return std::string("n3ds_") + ::testing::UnitTest::GetInstance()->current_test_info()->name() +
           ".bin";
  }
  std::string path_;
};

MRESULT InitializeFrom(const Engine& engine, const std::vector<uint8_t>& bytes) {
  const File file(bytes);
  return Norvale_3DSticker_Initialize(engine.handle(), file.path(), 0, 0);
}

std::vector<uint8_t> WithHeader(int32_t vertices, int32_t identity, int32_t expression) {
  std::vector<uint8_t> bytes = ModelBytes();
  const int32_t header[3] = {vertices, identity, expression};
  std::memcpy(bytes.data(), header, sizeof(header));
  return bytes;
}

TEST(EngineInterface, ANullEngineIsItsOwnResultOrNoEffect) {
  RigidOutput out(101);
  NSVL_OFFSCREEN image = ImageOf(640, 480);
  Points points = FrontalFace();
  EXPECT_EQ(Norvale_3DSticker_Initialize(nullptr, ModelPath().c_str(), 0, 0), N3DS_NULL_ENGINE);
  EXPECT_EQ(Norvale_3DSticker_InitializeEx(nullptr, ModelBytes().data(), 2141796, 0, 0),
            N3DS_NULL_ENGINE);
  EXPECT_EQ(Norvale_3DSticker_Uninitialize(nullptr), N3DS_NULL_ENGINE);
  EXPECT_EQ(Norvale_3DSticker_Process(nullptr, &image, 1, 101, points.data(), nullptr, nullptr,
                                      out.get()),
            N3DS_NULL_ENGINE);
  Norvale_3DSticker_SetDegreeAndMirror(nullptr, 90, 1);
  Norvale_3DSticker_DestroyEngine(nullptr);
  EXPECT_TRUE(out.Untouched());
}

static_assert(!std::is_copy_constructible_v<CNorvaleFaceShapeImp> &&
              !std::is_copy_assignable_v<CNorvaleFaceShapeImp>);

// Where the object puts landmark 9, which has no mirror partner, when it is delivered at (10, 20).
std::pair<int32_t, int32_t> PutUpright(const Engine& engine) {
  const auto* object = static_cast<const CNorvaleFaceShapeImp*>(engine.handle());
  Points points(101, {10, 20});
  int32_t upright[202] = {};
  N3DS_LANDMARK out = {upright, 101};
  NSVL_OFFSCREEN image = ImageOf(640, 480);
  EXPECT_NE(object->TransformInputInfo(&image, 101, points.data(), out), 0);
  return {upright[18], upright[19]};
}

TEST(EngineInterface, ANewEngineIsUprightAndNotReady) {
  const Engine engine;
  EXPECT_EQ(PutUpright(engine), std::pair(10, 20));
  EXPECT_FALSE(IsReady(engine));
}

// Leak checks see what is left of it.
TEST(EngineInterface, AnUnusedEngineIsDestroyed) {
  const Engine engine;
  EXPECT_NE(engine.handle(), nullptr);
}

TEST(EngineInterface, InitialisesFromAFileAndFromMemory) {
  const Engine file, memory;
  EXPECT_EQ(file.Initialize(), N3DS_OK);
  EXPECT_EQ(InitializeEx(memory, ModelBytes()), N3DS_OK);
  RigidOutput a(101), b(101);
  EXPECT_EQ(Process(file, ImageOf(640, 480), FrontalFace(), 101, &a), N3DS_OK);
  EXPECT_EQ(Process(memory, ImageOf(640, 480), FrontalFace(), 101, &b), N3DS_OK);
  EXPECT_EQ(a.AllBits(), b.AllBits());
}

TEST(EngineInterface, TheModelsBytesAreCopied) {
  const Engine engine;
  {
    std::vector<uint8_t> bytes = ModelBytes();
    ASSERT_EQ(InitializeEx(engine, bytes), N3DS_OK);
    std::fill(bytes.begin(), bytes.end(), 0xCD);
  }
  EXPECT_TRUE(IsReady(engine));
}

TEST(EngineInterface, AnUnreadableFileIsRefused) {
  const Engine engine;
  EXPECT_EQ(Norvale_3DSticker_Initialize(engine.handle(), nullptr, 0, 0), N3DS_FAILED);
  EXPECT_EQ(Norvale_3DSticker_Initialize(engine.handle(), "", 0, 0), N3DS_FAILED);
  EXPECT_EQ(Norvale_3DSticker_Initialize(engine.handle(), "/nonexistent/model.bin", 0, 0),
            N3DS_FAILED);
  EXPECT_FALSE(IsReady(engine));
}

TEST(EngineInterface, ADirectoryIsNoModel) {
  const Engine engine;
  for (const std::string& path : {std::string(N3DS_SOURCE_DIR), ::testing::TempDir(),
                                  std::string("/"), std::string("/proc")}) {
    EXPECT_EQ(Norvale_3DSticker_Initialize(engine.handle(), path.c_str(), 0, 0), N3DS_FAILED)
        << path;
  }
  EXPECT_FALSE(IsReady(engine));
}

TEST(EngineInterface, AFileThatCannotBeSoughtIsRefused) {
  const std::string path = ::testing::TempDir() + "n3ds_fifo";
  std::remove(path.c_str());
  ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
  std::FILE* writer = std::fopen(path.c_str(), "r+b");  // keeps the other end open
  ASSERT_NE(writer, nullptr);
  const Engine engine;
  EXPECT_EQ(Norvale_3DSticker_Initialize(engine.handle(), path.c_str(), 0, 0), N3DS_FAILED);
  std::fclose(writer);
  std::remove(path.c_str());
}

TEST(EngineInterface, AFileThatEndsBeforeItsSizeIsRefused) {
  // A file of the kernel's: a page long by its size, a few bytes when read.
  const char* path = "/sys/devices/system/cpu/possible";
  struct stat status;
  if (stat(path, &status) != 0 || status.st_size < 100) GTEST_SKIP() << "no such file here";
  const Engine engine;
  EXPECT_EQ(Norvale_3DSticker_Initialize(engine.handle(), path, 0, 0), N3DS_FAILED);
  EXPECT_FALSE(IsReady(engine));
}

TEST(EngineInterface, AnEmptyModelFileHasTheWrongSize) {
  const Engine engine;
  EXPECT_EQ(InitializeFrom(engine, {}), N3DS_BAD_VALUE);
  EXPECT_FALSE(IsReady(engine));
}

TEST(EngineInterface, AModelFileOneByteTooLongOrTooShortIsRefused) {
  const Engine engine;
  std::vector<uint8_t> bytes = ModelBytes();
  bytes.push_back(0);
  EXPECT_EQ(InitializeFrom(engine, bytes), N3DS_BAD_VALUE);
  EXPECT_EQ(InitializeEx(engine, bytes), N3DS_BAD_VALUE);
  EXPECT_FALSE(IsReady(engine));
  bytes.resize(bytes.size() - 2);
  EXPECT_EQ(InitializeFrom(engine, bytes), N3DS_BAD_VALUE);
  EXPECT_EQ(InitializeEx(engine, bytes), N3DS_BAD_VALUE);
  EXPECT_FALSE(IsReady(engine));
}

TEST(EngineInterface, AModelWithOtherCountsIsRefused) {
  const Engine engine;
  for (const std::vector<uint8_t>& bytes :
       {WithHeader(1812, 16, 21), WithHeader(1813, 16, 20), WithHeader(1812, 15, 20),
        WithHeader(0, 0, 0), WithHeader(16, 1812, 20)}) {
    EXPECT_EQ(InitializeFrom(engine, bytes), N3DS_BAD_VALUE);
    EXPECT_EQ(InitializeEx(engine, bytes), N3DS_BAD_VALUE);
    EXPECT_FALSE(IsReady(engine));
  }
}

size_t OpenDescriptors() {
  const std::filesystem::directory_iterator descriptors("/proc/self/fd");
  return static_cast<size_t>(std::distance(begin(descriptors), end(descriptors)));
}

TEST(EngineInterface, TheModelFileIsClosedAgain) {
  const Engine engine;
  const std::vector<uint8_t> wrong_size(10);
  const size_t before = OpenDescriptors();
  EXPECT_EQ(engine.Initialize(), N3DS_OK);
  EXPECT_EQ(OpenDescriptors(), before);
  EXPECT_EQ(Norvale_3DSticker_Uninitialize(engine.handle()), N3DS_OK);
  EXPECT_EQ(InitializeFrom(engine, wrong_size), N3DS_BAD_VALUE);
  EXPECT_EQ(Norvale_3DSticker_Initialize(engine.handle(), "/proc", 0, 0), N3DS_FAILED);
  EXPECT_EQ(OpenDescriptors(), before);
}

TEST(EngineInterface, NullDataOrSizeZeroIsRefused) {
  const Engine engine;
  const auto init = Norvale_3DSticker_InitializeEx;
  EXPECT_EQ(init(engine.handle(), nullptr, 2141796, 0, 0), N3DS_FAILED);
  EXPECT_EQ(init(engine.handle(), ModelBytes().data(), 0, 0, 0), N3DS_FAILED);
  EXPECT_EQ(init(engine.handle(), nullptr, 0, 0, 0), N3DS_FAILED);
  EXPECT_FALSE(IsReady(engine));
}

TEST(EngineInterface, AFailedInitialisationUninitialisesAnEngineThatWasReady) {
  const auto engine = Engine::Ready();
  EXPECT_EQ(Norvale_3DSticker_InitializeEx(engine->handle(), nullptr, 0, 0, 0), N3DS_FAILED);
  EXPECT_FALSE(IsReady(*engine));
  EXPECT_EQ(engine->Initialize(), N3DS_OK);
  EXPECT_EQ(Norvale_3DSticker_Initialize(engine->handle(), nullptr, 0, 0), N3DS_FAILED);
  EXPECT_FALSE(IsReady(*engine));
}

TEST(EngineInterface, AFailedInitialisationKeepsTheOrientation) {
  const auto engine = Engine::Ready(90, 1);
  const auto before = PutUpright(*engine);
  EXPECT_EQ(before, std::pair(460, 630));
  Norvale_3DSticker_Uninitialize(engine->handle());
  EXPECT_EQ(Norvale_3DSticker_Initialize(engine->handle(), "/nonexistent", 0, 0), N3DS_FAILED);
  EXPECT_EQ(PutUpright(*engine), before);
}

TEST(EngineInterface, UninitialisingTwiceOrNeverInitialisedIsFine) {
  const Engine engine;
  EXPECT_EQ(Norvale_3DSticker_Uninitialize(engine.handle()), N3DS_OK);
  ASSERT_EQ(engine.Initialize(), N3DS_OK);
  EXPECT_EQ(Norvale_3DSticker_Uninitialize(engine.handle()), N3DS_OK);
  EXPECT_EQ(Norvale_3DSticker_Uninitialize(engine.handle()), N3DS_OK);
  EXPECT_FALSE(IsReady(engine));
}

TEST(EngineInterface, AnEngineInitialisedAgainStartsAfresh) {
  const auto engine = Engine::Ready();
  RigidOutput first(165), later(165), again(165);
  const Points points = FrontalFace(165);
  ASSERT_EQ(Process(*engine, ImageOf(640, 480), points, 165, &first), N3DS_OK);
  // A track carries on: after another frame the same landmarks are smoothed.
  Points moved = points;
  for (__tag_point& p : moved) p.x += 3;
  ASSERT_EQ(Process(*engine, ImageOf(640, 480), moved, 165, &later), N3DS_OK);
  ASSERT_EQ(Process(*engine, ImageOf(640, 480), points, 165, &later), N3DS_OK);
  EXPECT_NE(first.AllBits(), later.AllBits());
  for (int i = 0; i < 3; i++) {
    ASSERT_EQ(Norvale_3DSticker_Uninitialize(engine->handle()), N3DS_OK);
    ASSERT_EQ(engine->Initialize(), N3DS_OK);
    // Another landmark count may be latched now.
    RigidOutput other(101);
    if (i == 1) {
      EXPECT_EQ(Process(*engine, ImageOf(640, 480), FrontalFace(), 101, &other), N3DS_OK);
      continue;
    }
    ASSERT_EQ(Process(*engine, ImageOf(640, 480), points, 165, &again), N3DS_OK);
    EXPECT_EQ(first.AllBits(), again.AllBits());
  }
}

TEST(EngineInterface, VersionIsTheSameRecordOnEveryCall) {
  const Norvale_3DSticker_Version* version = Norvale_3DSticker_GetVersion();
  ASSERT_NE(version, nullptr);
  const char* text = version->versionText;
  EXPECT_EQ(version->major, 1);
  EXPECT_EQ(version->minor, 1);
  EXPECT_EQ(version->build, 12021);
  EXPECT_EQ(version->revision, 63);
  EXPECT_STREQ(version->versionText, "Norvale_3DSticker_1.1.12021.63");
  EXPECT_STREQ(version->buildDate, "06/19/2018");
  EXPECT_GT(std::strlen(version->notice), 0u);
  EXPECT_EQ(Norvale_3DSticker_GetVersion(), version);
  EXPECT_EQ(version->versionText, text);
}

TEST(EngineInterface, EachCallRestoresAVersionRecordThatWasWrittenTo) {
  auto* version = const_cast<Norvale_3DSticker_Version*>(Norvale_3DSticker_GetVersion());
  const std::string date = version->buildDate, notice = version->notice;
  const Norvale_3DSticker_Version before = *version;
  for (const char* text : {before.versionText, before.buildDate, before.notice}) {
    std::memset(const_cast<char*>(text), 'X', std::strlen(text) + 1);
  }
  *version = {99, 98, 97, 96, nullptr, nullptr, nullptr};
  Norvale_3DSticker_GetVersion();
  EXPECT_EQ(std::memcmp(version, &before, sizeof(before)), 0);
  EXPECT_STREQ(version->versionText, "Norvale_3DSticker_1.1.12021.63");
  EXPECT_EQ(version->buildDate, date);
  EXPECT_EQ(version->notice, notice);
}

}  // namespace
}  // namespace n3ds::testing
