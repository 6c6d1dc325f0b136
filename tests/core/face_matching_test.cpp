// SPDX-License-Identifier: MIT
#include "core/face_matching.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstring>
#include <memory>
#include <vector>

namespace n3ds::testing {
namespace {

using ::testing::ElementsAre;

constexpr uint32_t kLandmarks = 101;

// Landmark sets of faces of which all points lie at one place.
std::vector<int32_t> FacesAt(const std::vector<int32_t>& places) {
  std::vector<int32_t> landmarks;
  for (const int32_t place : places) landmarks.insert(landmarks.end(), 2 * kLandmarks, place);
  landmarks.resize(2 * kLandmarks * kSlotCount);
  return landmarks;
}

std::vector<int32_t> Assign(const std::vector<int32_t>& faces, size_t face_count,
                            const std::vector<int32_t>& previous, size_t previous_count) {
  FaceAssignment assignment;
  EXPECT_EQ(AssignFaces(faces.data(), static_cast<uint32_t>(face_count), previous.data(),
                        static_cast<uint32_t>(previous_count), kLandmarks, &assignment),
            N3DS_OK);
  for (size_t j = face_count; j < kSlotCount; j++) EXPECT_EQ(assignment.previous[j], -1);
  return {assignment.previous, assignment.previous + face_count};
}

std::vector<int32_t> AssignPlaces(const std::vector<int32_t>& faces,
                                  const std::vector<int32_t>& previous) {
  return Assign(FacesAt(faces), faces.size(), FacesAt(previous), previous.size());
}

TEST(AssignFaces, MoreThanFiveFacesAreRefused) {
  const std::vector<int32_t> landmarks(2 * kLandmarks * 6, 0);
  FaceAssignment assignment;
  EXPECT_EQ(AssignFaces(landmarks.data(), 6, landmarks.data(), 5, kLandmarks, &assignment),
            N3DS_BAD_VALUE);
  EXPECT_EQ(AssignFaces(landmarks.data(), 5, landmarks.data(), 6, kLandmarks, &assignment),
            N3DS_BAD_VALUE);
  EXPECT_EQ(AssignFaces(landmarks.data(), 5, landmarks.data(), 5, kLandmarks, &assignment),
            N3DS_OK);
}

TEST(AssignFaces, TheFirstFacesOfAllAreNew) {
  EXPECT_THAT(AssignPlaces({10}, {}), ElementsAre(-1));
  EXPECT_THAT(AssignPlaces({10, 20, 30, 40, 50}, {}), ElementsAre(-1, -1, -1, -1, -1));
}

TEST(AssignFaces, FacesKeepTheirTracksWhenTheirOrderChanges) {
  EXPECT_THAT(AssignPlaces({100, 200, 300}, {301, 99, 202}), ElementsAre(1, 2, 0));
}

TEST(AssignFaces, OfTwoFacesTheNearerInheritsASingleTrack) {
  EXPECT_THAT(AssignPlaces({100, 200}, {110}), ElementsAre(0, -1));
  EXPECT_THAT(AssignPlaces({100, 200}, {190}), ElementsAre(-1, 0));
}

TEST(AssignFaces, ASingleFaceInheritsTheNearerOfTwoTracks) {
  EXPECT_THAT(AssignPlaces({110}, {100, 200}), ElementsAre(0));
  EXPECT_THAT(AssignPlaces({190}, {100, 200}), ElementsAre(1));
}

TEST(AssignFaces, TheFirstWinsATie) {
  EXPECT_THAT(AssignPlaces({150}, {100, 200}), ElementsAre(0));
  EXPECT_THAT(AssignPlaces({100, 200}, {150}), ElementsAre(0, -1));
}

TEST(AssignFaces, TwoFacesMayContinueTheSameTrack) {
  EXPECT_THAT(AssignPlaces({100, 110}, {105, 900}), ElementsAre(0, 0));
  EXPECT_THAT(AssignPlaces({100, 110, 120}, {900, 105, 800}), ElementsAre(1, 1, 1));
}

TEST(AssignFaces, WithMoreFacesALaterTrackTakesOverAnEarlierOnesFace) {
  // Both tracks are nearest to face 0; the second has it in the end.
  EXPECT_THAT(AssignPlaces({100, 500, 900}, {101, 102}), ElementsAre(1, -1, -1));
}

TEST(AssignFaces, WithMoreFacesAScanTakesBackTheClaimOfItsFirstCandidate) {
  // Track 0 claims face 0. Track 1 starts its scan there, finds face 1 nearer and gives face 0 up:
  // that face is new although track 0 was its own.
  EXPECT_THAT(AssignPlaces({100, 500, 900}, {100, 500}), ElementsAre(-1, 1, -1));
  // With the tracks the other way round nothing is lost: track 1 ends at face 0.
  EXPECT_THAT(AssignPlaces({100, 500, 900}, {500, 100}), ElementsAre(1, 0, -1));
}

TEST(AssignFaces, OnlyTheKeyLandmarksCount) {
  const std::vector<int> key_landmarks = {39, 45, 51, 57, 66, 67, 68, 69, 70, 71};
  for (int k = 0; k < static_cast<int>(kLandmarks); k++) {
    for (size_t axis = 0; axis < 2; axis++) {
      // Face 0 lies exactly on track 0 but for landmark k; face 1 is a little off everywhere.
      std::vector<int32_t> faces = FacesAt({100, 101});
      faces[static_cast<size_t>(2 * k) + axis] = 2000;
      const bool key =
          std::find(key_landmarks.begin(), key_landmarks.end(), k) != key_landmarks.end();
      const std::vector<int32_t> expected =
          key ? std::vector<int32_t>{-1, 0} : std::vector<int32_t>{0, -1};
      EXPECT_EQ(Assign(faces, 2, FacesAt({100}), 1), expected) << k;
    }
  }
}

TEST(AssignFaces, DistancesAreSumsOfAbsoluteDifferences) {
  // 10 landmarks x 2 axes: an offset of 3 everywhere is 60; one landmark off by 59 is nearer, by 61
  // farther, whatever the signs.
  for (const int32_t offset : {59, 61}) {
    for (const int32_t sign : {-1, 1}) {
      std::vector<int32_t> faces = FacesAt({1000, 1000 + sign * 3});
      faces[2 * 45] += sign * (offset - 30);
      faces[2 * 70 + 1] -= sign * 30;
      const std::vector<int32_t> expected =
          offset < 60 ? std::vector<int32_t>{0, -1} : std::vector<int32_t>{-1, 0};
      EXPECT_EQ(Assign(faces, 2, FacesAt({1000}), 1), expected);
    }
  }
}

TEST(AssignFaces, DistancesWrapIn32Bits) {
  // 10 landmarks off by 2^28 in x and in y sum to 20 * 2^28 = 2^32 + 2^30: 2^30 remains, less than
  // the 1.2 * 2^30 of the other face.
  std::vector<int32_t> faces = FacesAt({1 << 28, 0});
  for (size_t i = 0; i < 2 * kLandmarks; i++) faces[2 * kLandmarks + i] = 64424509;
  EXPECT_THAT(Assign(faces, 2, FacesAt({0}), 1), ElementsAre(0, -1));
  // A sum that wraps to below 0 is the smallest of all.
  EXPECT_THAT(AssignPlaces({0, 120000000}, {0}), ElementsAre(-1, 0));
  // Differences wrap too: from one end of the range to the other is one step.
  EXPECT_THAT(AssignPlaces({INT32_MAX - 1, INT32_MIN}, {INT32_MAX}), ElementsAre(0, -1));
  EXPECT_THAT(AssignPlaces({INT32_MAX - 2, INT32_MIN}, {INT32_MAX}), ElementsAre(-1, 0));
}

// A context of which every byte of every slot is known.
class Slots {
 public:
  explicit Slots(MHandle memory = nullptr) : context(std::make_unique<TrackingContext>()) {
    std::memset(static_cast<void*>(context.get()), 0, sizeof(TrackingContext));
    context->memory = memory;
    context->landmarkNum = kLandmarks;
    for (int slot = 0; slot < kSlotCount; slot++) {
      const int value = 16 * (slot + 1);
      Fill(context->rigidResult[slot], value + 1);
      Fill(context->maskPose[slot], value + 2);
      Fill(context->poseRef[slot], value + 3);
      Fill(context->pose[slot], value + 4);
      Fill(context->fitState[slot], value + 5);
      Fill(context->shape[slot], value + 6);
      Fill(context->contourState[slot], value + 7);
      Fill(context->identityCoef[slot], value + 8);
      Fill(context->expressionCoef[slot], value + 9);
      Fill(context->trackState[slot], value + 10);
      Fill(context->trackFlag[slot], value + 11);
      for (uint32_t i = 0; i < 2 * kLandmarks; i++) landmarks.push_back(value + 12);
    }
  }
  int32_t Move(const std::vector<int32_t>& previous) {
    FaceAssignment assignment;
    std::fill_n(assignment.previous, kSlotCount, -1);
    std::copy(previous.begin(), previous.end(), assignment.previous);
    return MoveTracks(assignment, static_cast<uint32_t>(previous.size()), context.get(),
                      landmarks.data());
  }
  // Which slot the state that travels with a face came from: -1 new, -2 a mixture.
  int Origin(int slot) const {
    const int b = FirstByte(context->trackFlag[slot]);
    const int value = b - 11;
    if (b != 0) {
      const bool all =
          IsFilled(context->poseRef[slot], value + 3) && IsFilled(context->pose[slot], value + 4) &&
          IsFilled(context->fitState[slot], value + 5) &&
          IsFilled(context->shape[slot], value + 6) &&
          IsFilled(context->identityCoef[slot], value + 8) &&
          IsFilled(context->expressionCoef[slot], value + 9) &&
          IsFilled(context->trackState[slot], value + 10) &&
          IsFilled(context->trackFlag[slot], value + 11) && LandmarksAre(slot, value + 12);
      return all ? value / 16 - 1 : -2;
    }
    const int own = 16 * (slot + 1);
    const bool fresh =
        IsFilled(context->pose[slot], 0) && IsFilled(context->identityCoef[slot], 0) &&
        IsFilled(context->expressionCoef[slot], 0) && IsFilled(context->trackState[slot], 0) &&
        LandmarksAre(slot, 0) &&
        // What a new face does not need cleared stays the slot's.
        IsFilled(context->poseRef[slot], own + 3) && IsFilled(context->fitState[slot], own + 5) &&
        IsFilled(context->shape[slot], own + 6);
    return fresh ? -1 : -2;
  }
  // What belongs to the slot and not to the face.
  bool SlotsOwnIsUnmoved() const {
    bool same = true;
    for (int slot = 0; slot < kSlotCount; slot++) {
      const int value = 16 * (slot + 1);
      same = same && IsFilled(context->rigidResult[slot], value + 1) &&
             IsFilled(context->maskPose[slot], value + 2) &&
             IsFilled(context->contourState[slot], value + 7);
    }
    return same;
  }

  std::unique_ptr<TrackingContext> context;
  std::vector<int32_t> landmarks;

 private:
  template <typename T>
  static void Fill(T& member, int byte) {
    std::memset(static_cast<void*>(&member), byte, sizeof(member));
  }
  template <typename T>
  static bool IsFilled(const T& member, int byte) {
    const auto* bytes = reinterpret_cast<const unsigned char*>(&member);
    return std::all_of(bytes, bytes + sizeof(T), [byte](unsigned char b) { return b == byte; });
  }
  template <typename T>
  static int FirstByte(const T& member) {
    return *reinterpret_cast<const unsigned char*>(&member);
  }
  bool LandmarksAre(int slot, int32_t value) const {
    const auto first = landmarks.begin() + slot * 2 * static_cast<int>(kLandmarks);
    return std::all_of(first, first + 2 * kLandmarks, [value](int32_t c) { return c == value; });
  }
};

std::vector<int> Origins(const Slots& slots) {
  std::vector<int> origins;
  for (int slot = 0; slot < kSlotCount; slot++) origins.push_back(slots.Origin(slot));
  return origins;
}

TEST(MoveTracks, FacesInTheirPlacesAreLeftAlone) {
  Slots slots;
  EXPECT_EQ(slots.Move({0, 1, 2, 3, 4}), N3DS_OK);
  EXPECT_THAT(Origins(slots), ElementsAre(0, 1, 2, 3, 4));
  EXPECT_TRUE(slots.SlotsOwnIsUnmoved());
}

TEST(MoveTracks, FacesTakeAllTheirStateAlong) {
  Slots slots;
  EXPECT_EQ(slots.Move({4, 3, 2, 1, 0}), N3DS_OK);
  EXPECT_THAT(Origins(slots), ElementsAre(4, 3, 2, 1, 0));
  EXPECT_TRUE(slots.SlotsOwnIsUnmoved());
}

TEST(MoveTracks, FacesMoveInARing) {
  Slots slots;
  EXPECT_EQ(slots.Move({1, 2, 3, 4, 0}), N3DS_OK);
  EXPECT_THAT(Origins(slots), ElementsAre(1, 2, 3, 4, 0));
}

TEST(MoveTracks, OneTrackMayFeedSeveralFaces) {
  Slots slots;
  EXPECT_EQ(slots.Move({2, 2, 0}), N3DS_OK);
  EXPECT_THAT(Origins(slots), ElementsAre(2, 2, 0, 3, 4));
}

TEST(MoveTracks, ANewFaceStartsFromZeros) {
  Slots slots;
  EXPECT_EQ(slots.Move({1, -1, 0}), N3DS_OK);
  EXPECT_THAT(Origins(slots), ElementsAre(1, -1, 0, 3, 4));
  EXPECT_TRUE(slots.SlotsOwnIsUnmoved());
}

TEST(MoveTracks, SlotsBeyondTheFacesAreLeftAlone) {
  Slots slots;
  EXPECT_EQ(slots.Move({4}), N3DS_OK);
  EXPECT_THAT(Origins(slots), ElementsAre(4, 1, 2, 3, 4));
}

TEST(MoveTracks, ExhaustedMemoryChangesNothing) {
  int refused = 0;
  int32_t result = N3DS_NO_MEMORY;
  for (size_t size = 1000; result != N3DS_OK; size += 4000) {
    ASSERT_LT(size, 300000u);
    std::vector<unsigned char> area(size);
    const MHandle pool = MMemMgrCreate(area.data(), size);
    const size_t before = GetMaxAllocMemSize(pool);
    Slots slots(pool);
    result = slots.Move({1, 0, -1});
    EXPECT_EQ(GetMaxAllocMemSize(pool), before);
    if (result == N3DS_OK) {
      EXPECT_THAT(Origins(slots), ElementsAre(1, 0, -1, 3, 4));
    } else {
      ASSERT_EQ(result, N3DS_NO_MEMORY);
      EXPECT_THAT(Origins(slots), ElementsAre(0, 1, 2, 3, 4));
      refused++;
    }
  }
  EXPECT_GT(refused, 10);
}

}  // namespace
}  // namespace n3ds::testing
