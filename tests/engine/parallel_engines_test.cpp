// SPDX-License-Identifier: MIT
// Distinct engines on threads of their own do not disturb each other.
#include <gtest/gtest.h>

#include <thread>
#include <vector>

#include "engine/engine_testing.h"

namespace n3ds::testing {
namespace {

constexpr int kEngines = 4;
constexpr int kFrames = 12;

using Results = std::vector<std::vector<uint32_t>>;

// The track of engine number `which`: as many faces, another layout, another size.
Results RunTrack(int which) {
  const int faces = 1 + which % 4;
  const auto landmarks = static_cast<uint32_t>(which % 2 == 0 ? 101 : 165);
  const int width = 640 + 160 * which;
  std::vector<Person> people;
  for (int k = 0; k < faces; k++) {
    people.push_back(Person(static_cast<uint64_t>(10 * which + k)).At(130.0 * (k - 1), 0, 650));
  }
  const auto engine = Engine::Ready();
  Results results;
  for (int frame = 0; frame < kFrames; frame++) {
    Points points;
    for (Person& person : people) {
      const Points face =
          ToPoints(person.Detect(frame, width, 480, static_cast<int>(landmarks), 1));
      points.insert(points.end(), face.begin(), face.end());
    }
    RigidOutput out(landmarks);
    EXPECT_EQ(Process(*engine, ImageOf(width, 480), points, landmarks, &out), N3DS_OK);
    results.push_back(out.AllBits());
  }
  return results;
}

TEST(ParallelEngines, GiveTheSameResultsAsAlone) {
  Results alone[kEngines], together[kEngines];
  for (int i = 0; i < kEngines; i++) alone[i] = RunTrack(i);
  std::vector<std::thread> threads;
  for (int i = 0; i < kEngines; i++) {
    threads.emplace_back([i, &together] { together[i] = RunTrack(i); });
  }
  for (std::thread& thread : threads) thread.join();
  for (int i = 0; i < kEngines; i++) EXPECT_EQ(together[i], alone[i]) << i;
}

TEST(ParallelEngines, AnEngineMayMoveBetweenThreads) {
  const auto engine = Engine::Ready(), other = Engine::Ready();
  Person person(3), same(3);
  for (int frame = 0; frame < 4; frame++) {
    RigidOutput a(101), b(101);
    const Points points = ToPoints(person.Detect(frame, 640, 480, 101, 1));
    std::thread([&] {
      EXPECT_EQ(Process(*engine, ImageOf(640, 480), points, 101, &a), N3DS_OK);
    }).join();
    EXPECT_EQ(
        Process(*other, ImageOf(640, 480), ToPoints(same.Detect(frame, 640, 480, 101, 1)), 101, &b),
        N3DS_OK);
    EXPECT_EQ(a.AllBits(), b.AllBits());
  }
}

TEST(ParallelEngines, TheVersionMayBeAskedForByManyThreadsAtOnce) {
  std::vector<std::thread> threads;
  for (int i = 0; i < kEngines; i++) {
    threads.emplace_back([] {
      for (int call = 0; call < 100; call++) {
        const Norvale_3DSticker_Version* version = Norvale_3DSticker_GetVersion();
        EXPECT_EQ(version->build, 12021);
        EXPECT_STREQ(version->versionText, "Norvale_3DSticker_1.1.12021.63");
      }
    });
  }
  for (std::thread& thread : threads) thread.join();
}

}  // namespace
}  // namespace n3ds::testing
