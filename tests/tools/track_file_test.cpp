// SPDX-License-Identifier: MIT
#include "tracks/track_file.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <sstream>
#include <string>

#include "support/test_random.h"

namespace n3ds::tool {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::StartsWith;

const char kHeader[] =
    R"({"format":"face-track","version":1,"width":640,"height":480,"fps":30,"landmarks":101,)"
    R"("degree":0,"mirror":0,"focal":560.0,"source":"made up"})";

const char kTruth[] = R"("truth":{"rotation":[1,0,0,0,-1,0,0,0,-1],"translation":[1.5,-2,800.25]})";

std::string Replaced(std::string text, const std::string& what, const std::string& with) {
  const std::size_t at = text.find(what);
  EXPECT_NE(at, std::string::npos) << what;
  return at == std::string::npos ? text : text.replace(at, what.size(), with);
}

// "[0,1,2,...]" with `count` numbers.
std::string Points(int count) {
  std::string text = "[";
  for (int i = 0; i < count; ++i) text += (i == 0 ? "" : ",") + std::to_string(i);
  return text + "]";
}

std::string Face(int id, const std::string& more = "", int numbers = 202) {
  return R"({"id":)" + std::to_string(id) + R"(,"points":)" + Points(numbers) +
         (more.empty() ? "" : "," + more) + "}";
}

std::string Frame(int number, const std::string& faces) {
  return R"({"frame":)" + std::to_string(number) + R"(,"faces":[)" + faces + "]}";
}

Track Read(const std::string& text) {
  std::istringstream in(text);
  return ReadTrack(in, "some/talk.track.jsonl");
}

// The message with which a text is refused; empty when it is accepted.
std::string Refusal(const std::string& text) {
  try {
    Read(text);
  } catch (const TrackError& error) {
    return error.what();
  }
  return "";
}

std::string HeaderRefusal(const std::string& what, const std::string& with) {
  return Refusal(Replaced(kHeader, what, with) + "\n" + Frame(0, Face(1)) + "\n");
}

std::string FrameRefusal(const std::string& frame) {
  return Refusal(std::string(kHeader) + "\n" + Frame(0, Face(1)) + "\n" + frame + "\n");
}

TEST(TrackFile, ReadsHeaderFramesAndTruth) {
  const Track track =
      Read(std::string(kHeader) + "\n" + Frame(0, Face(7, kTruth)) + "\n" + Frame(1, "") + "\n" +
           Frame(4, Face(2, kTruth) + "," + Face(7, kTruth)) + "\n");
  EXPECT_EQ(track.name, "talk");
  EXPECT_EQ(track.header.width, 640);
  EXPECT_EQ(track.header.height, 480);
  EXPECT_EQ(track.header.fps, 30);
  EXPECT_EQ(track.header.landmarks, 101);
  EXPECT_EQ(track.header.source, "made up");
  EXPECT_EQ(track.header.focal, 560.0);
  EXPECT_FALSE(track.header.noise_px.has_value());
  ASSERT_EQ(track.frames.size(), 3u);
  EXPECT_EQ(track.frames[2].number, 4);
  ASSERT_EQ(track.frames[2].faces.size(), 2u);
  EXPECT_EQ(track.frames[2].faces[1].id, 7);
  EXPECT_EQ(track.frames[0].faces[0].points[201], 201);
  EXPECT_EQ(track.frames[0].faces[0].truth->translation[2], 800.25);
  EXPECT_EQ(track.FaceCount(), 3u);
  EXPECT_EQ(track.MostFaces(), 2u);
  EXPECT_TRUE(track.HasTruth());
}

TEST(TrackFile, TakesALastLineWithoutNewlineAndWindowsLineEnds) {
  EXPECT_EQ(Refusal(std::string(kHeader) + "\r\n" + Frame(0, "") + "\r\n" + Frame(1, "")), "");
}

TEST(TrackFile, TakesPointsOutsideTheImageAndExtraFields) {
  const std::string face = Replaced(Face(1, R"("colour":"blue")"), "[0,1,", "[-50,99999,");
  const Track track = Read(std::string(kHeader) + "\n" + Frame(0, face));
  EXPECT_EQ(track.frames[0].faces[0].points[0], -50);
  EXPECT_EQ(track.frames[0].faces[0].points[1], 99999);
}

TEST(TrackFile, HasTruthOnlyWhenEveryFaceHas) {
  EXPECT_FALSE(Read(std::string(kHeader) + "\n" + Frame(0, Face(1))).HasTruth());
  EXPECT_FALSE(
      Read(std::string(kHeader) + "\n" + Frame(0, Face(1, kTruth) + "," + Face(2))).HasTruth());
  EXPECT_FALSE(Read(std::string(kHeader) + "\n" + Frame(0, "")).HasTruth());
}

TEST(TrackFile, NamesFileAndLine) {
  EXPECT_THAT(FrameRefusal("{"), StartsWith("some/talk.track.jsonl:3: "));
  EXPECT_THAT(HeaderRefusal("640", "0"), StartsWith("some/talk.track.jsonl:1: "));
}

TEST(TrackFile, RefusesAFileThatCannotBeOpened) {
  for (const char* path : {"/nonexistent/x.track.jsonl", "/"}) {
    try {
      ReadTrackFile(path);
      ADD_FAILURE() << path;
    } catch (const TrackError& error) {
      EXPECT_EQ(error.what(), std::string(path) + ": the file cannot be opened");
    }
  }
}

TEST(TrackFile, RefusesAnEmptyFileAndOneWithoutFrames) {
  EXPECT_THAT(Refusal(""), HasSubstr("the file is empty"));
  EXPECT_THAT(Refusal("\n"), HasSubstr(":1: the line is empty"));
  EXPECT_THAT(Refusal(kHeader), HasSubstr("the file contains no frames"));
}

TEST(TrackFile, RefusesWhatIsNotJson) {
  EXPECT_THAT(Refusal("hello\n"), HasSubstr(":1: not valid JSON (at character 1)"));
  EXPECT_THAT(FrameRefusal(R"({"frame":1,"faces":[)"), HasSubstr(":3: not valid JSON"));
  EXPECT_THAT(FrameRefusal(Frame(1, "") + "}"), HasSubstr(":3: not valid JSON (at character 23)"));
  EXPECT_THAT(FrameRefusal(""), HasSubstr(":3: the line is empty"));
  EXPECT_THAT(FrameRefusal("{\"frame\":1,\"faces\":[],\"x\":\"\xff\xfe\"}"),
              HasSubstr("not valid JSON"));
  EXPECT_THAT(FrameRefusal(std::string("\0{}", 3)), HasSubstr("not valid JSON"));
  EXPECT_THAT(FrameRefusal(R"({"frame":1,"faces":[],"x":1e999})"), HasSubstr("not valid JSON"));
  EXPECT_THAT(FrameRefusal("[1,2,3]"), HasSubstr(":3: the line is [1,2,3], expected an object"));
  EXPECT_THAT(FrameRefusal("17"), HasSubstr("the line is 17, expected an object"));
}

TEST(TrackFile, RefusesDeeplyNestedAndEndlessLines) {
  const auto nested = [](std::size_t depth) {
    return std::string(depth, '[') + std::string(depth, ']');
  };
  const std::string refused = "some/talk.track.jsonl:3: nested more than 64 levels deep";
  // As the whole line, as a value that is wrong, in a field that nothing reads.
  for (const std::string& line :
       {std::string(500000, '['), nested(200000), R"({"frame":)" + nested(200000) + "}",
        R"({"frame":1,"faces":[],"x":)" + nested(200000) + "}",
        R"({"frame":1,"faces":[],"x":)" + nested(64) + "}"}) {
    EXPECT_EQ(FrameRefusal(line), refused);
  }
  EXPECT_EQ(FrameRefusal(R"({"frame":1,"faces":[],"x":)" + nested(63) + "}"), "");
  // Brackets in strings are text.
  EXPECT_EQ(FrameRefusal(R"({"frame":1,"faces":[],"x":"\"\\\"[)" + std::string(99, '{') + "\"}"),
            "");
  EXPECT_THAT(FrameRefusal(std::string(kMaxTrackLine + 1, ' ')),
              HasSubstr(":3: the line is longer than a frame can be"));
}

TEST(TrackFile, RefusesALineThatCannotBeRead) {
  class Broken : public std::stringbuf {
   public:
    explicit Broken(const std::string& text) : std::stringbuf(text, std::ios::in) {}

   protected:
    int_type underflow() override { throw std::ios_base::failure("device"); }
  };
  Broken buffer(std::string(kHeader) + "\n{");
  std::istream in(&buffer);
  try {
    ReadTrack(in, "x");
    ADD_FAILURE();
  } catch (const TrackError& error) {
    EXPECT_STREQ(error.what(), "x:2: the line cannot be read");
  }
}

TEST(TrackReader, GivesEachFrameWhenItsLineHasArrived) {
  std::stringstream in;
  in << kHeader << '\n' << Frame(3, Face(1)) << '\n';
  TrackReader reader(in, "x");
  EXPECT_EQ(reader.header().width, 640);
  EXPECT_EQ(reader.Next()->number, 3);
  in << Frame(5, "") << '\n';
  EXPECT_EQ(reader.Next()->number, 5);
  EXPECT_FALSE(reader.Next().has_value());
}

TEST(TrackFile, RefusesAnotherFormatOrVersion) {
  EXPECT_THAT(Refusal("{}"), HasSubstr("not the header of a landmark track"));
  EXPECT_THAT(HeaderRefusal("face-track", "hand-track"), HasSubstr("not the header"));
  EXPECT_THAT(HeaderRefusal("\"face-track\"", "7"), HasSubstr("not the header"));
  EXPECT_THAT(HeaderRefusal("\"version\":1", "\"version\":2"),
              HasSubstr("unsupported version 2 (expected 1)"));
  EXPECT_THAT(HeaderRefusal("\"version\":1", "\"version\":\"1\""),
              HasSubstr("expected an integer"));
}

TEST(TrackFile, RefusesAHeaderWithAMissingField) {
  for (const char* field :
       {"version", "width", "height", "fps", "landmarks", "degree", "mirror", "source"}) {
    const std::string quoted = "\"" + std::string(field) + "\"";
    EXPECT_THAT(HeaderRefusal(quoted, "\"other\""),
                HasSubstr("some/talk.track.jsonl:1: field " + quoted + " is missing"));
  }
}

TEST(TrackFile, RefusesHeaderValuesThatMakeNoSense) {
  EXPECT_THAT(HeaderRefusal("640", "0"), HasSubstr("\"width\" is 0, outside 1 to 16384"));
  EXPECT_THAT(HeaderRefusal("480", "-480"), HasSubstr("\"height\" is -480, outside"));
  EXPECT_THAT(HeaderRefusal("480", "480.5"), HasSubstr("expected an integer"));
  EXPECT_THAT(HeaderRefusal("640", "18446744073709551615"), HasSubstr("outside"));
  EXPECT_THAT(HeaderRefusal("640", "99999999999999999999999"), HasSubstr("expected an integer"));
  EXPECT_THAT(HeaderRefusal("\"fps\":30", "\"fps\":0"), HasSubstr("\"fps\" is not positive"));
  EXPECT_THAT(HeaderRefusal("\"fps\":30", "\"fps\":null"), HasSubstr("expected a number"));
  EXPECT_THAT(HeaderRefusal("101", "68"), HasSubstr("\"landmarks\" is 68, expected 101 or 165"));
  EXPECT_THAT(HeaderRefusal("\"degree\":0", "\"degree\":45"),
              HasSubstr("\"degree\" is 45, expected 0, 90, 180 or 270"));
  EXPECT_THAT(HeaderRefusal("\"degree\":0", "\"degree\":-90"), HasSubstr("\"degree\" is -90"));
  EXPECT_THAT(HeaderRefusal("\"degree\":0", "\"degree\":360"), HasSubstr("\"degree\" is 360"));
  EXPECT_THAT(HeaderRefusal("\"mirror\":0", "\"mirror\":2"), HasSubstr("\"mirror\" is 2, outside"));
  EXPECT_THAT(HeaderRefusal("\"mirror\":0", "\"mirror\":true"), HasSubstr("expected an integer"));
  EXPECT_THAT(HeaderRefusal("560.0", "0"), HasSubstr("\"focal\" is 0, expected at least 1"));
  EXPECT_THAT(HeaderRefusal("\"made up\"", "3"), HasSubstr("\"source\" is 3, expected a string"));
}

TEST(TrackFile, RefusesFramesWithMissingFields) {
  EXPECT_THAT(FrameRefusal(R"({"faces":[]})"), HasSubstr(":3: field \"frame\" is missing"));
  EXPECT_THAT(FrameRefusal(R"({"frame":1})"), HasSubstr(":3: field \"faces\" is missing"));
  EXPECT_THAT(FrameRefusal(R"({"frame":1,"faces":{}})"),
              HasSubstr("\"faces\" is {}, expected an array"));
  EXPECT_THAT(FrameRefusal(R"({"frame":1,"faces":[5]})"),
              HasSubstr("a face is 5, expected an object"));
  EXPECT_THAT(FrameRefusal(R"({"frame":1,"faces":[{"points":[]}]})"),
              HasSubstr("field \"id\" is missing"));
  EXPECT_THAT(FrameRefusal(R"({"frame":1,"faces":[{"id":3}]})"),
              HasSubstr("field \"points\" is missing"));
}

TEST(TrackFile, RefusesFramesOutOfOrder) {
  EXPECT_THAT(FrameRefusal(Frame(0, "")), HasSubstr(":3: frame 0 follows frame 0"));
  EXPECT_THAT(FrameRefusal(Frame(-1, "")), HasSubstr("\"frame\" is -1, outside"));
  EXPECT_THAT(FrameRefusal(R"({"frame":"1","faces":[]})"), HasSubstr("expected an integer"));
}

TEST(TrackFile, RefusesTheWrongNumberOfPoints) {
  EXPECT_THAT(FrameRefusal(Frame(1, Face(4, "", 201))),
              HasSubstr(":3: \"points\" of face 4 has 201 numbers, expected 202"));
  EXPECT_THAT(FrameRefusal(Frame(1, Face(4, "", 330))), HasSubstr("330 numbers, expected 202"));
  EXPECT_THAT(FrameRefusal(R"({"frame":1,"faces":[{"id":3,"points":7}]})"),
              HasSubstr("\"points\" of face 3 is 7, expected an array"));
}

TEST(TrackFile, RoundsFractionsHalfUp) {
  const std::string face = Replaced(Face(4), "[0,1,2,3,4,5,6,", "[0.5,1.49,-2.5,-0.51,4e0,5.0,6,");
  const Track track = Read(std::string(kHeader) + "\n" + Frame(0, face));
  EXPECT_THAT(std::vector<int>(track.frames[0].faces[0].points.begin(),
                               track.frames[0].faces[0].points.begin() + 8),
              ::testing::ElementsAre(1, 1, -2, -1, 4, 5, 6, 7));
  EXPECT_EQ(track.rounded_coordinates, 4u);  // 4e0 and 5.0 have no fraction
  EXPECT_EQ(Read(std::string(kHeader) + "\n" + Frame(0, Face(4))).rounded_coordinates, 0u);
}

TEST(TrackFile, RefusesCoordinatesThatAreNoNumbersOrTooLarge) {
  const auto with = [](const std::string& value) {
    return FrameRefusal(Frame(1, Replaced(Face(4), "[0,1,2,", "[0,1," + value + ",")));
  };
  EXPECT_THAT(with("\"2\""),
              HasSubstr("a number of \"points\" of face 4 is \"2\", expected a number"));
  EXPECT_THAT(with("null"), HasSubstr("is null, expected a number"));
  EXPECT_THAT(with("[2,3]"), HasSubstr("is [2,3], expected a number"));
  EXPECT_THAT(with("NaN"), HasSubstr("not valid JSON"));
  EXPECT_THAT(with("1e999"), HasSubstr("not valid JSON (a number is too large)"));
  EXPECT_THAT(with("1e300"), HasSubstr("is 1e+300, outside"));
  EXPECT_THAT(with("2147483647.5"), HasSubstr("outside"));
  EXPECT_EQ(with("2147483647.4"), "");
  EXPECT_THAT(with("-2147483648.6"), HasSubstr("outside"));
  EXPECT_THAT(with("2147483648"), HasSubstr("outside -2147483648 to 2147483647"));
  EXPECT_THAT(with("18446744073709551615"), HasSubstr("outside"));
  EXPECT_EQ(with("-2147483648"), "");
}

TEST(TrackFile, RefusesMoreThanFiveFacesAndTheSameFaceTwice) {
  std::string faces;
  for (int i = 0; i < 6; ++i) faces += (i == 0 ? "" : ",") + Face(i);
  EXPECT_THAT(FrameRefusal(Frame(1, faces)), HasSubstr(":3: a frame has 6 faces (at most 5)"));
  EXPECT_THAT(FrameRefusal(Frame(1, Face(2) + "," + Face(2))),
              HasSubstr("face 2 appears twice in a frame"));
}

TEST(TrackFile, RefusesDamagedTruth) {
  const auto with = [](const std::string& what, const std::string& by) {
    return FrameRefusal(Frame(1, Face(4, Replaced(kTruth, what, by))));
  };
  EXPECT_THAT(with("\"rotation\"", "\"turn\""), HasSubstr("field \"rotation\" is missing"));
  EXPECT_THAT(with("\"translation\"", "\"shift\""), HasSubstr("field \"translation\" is missing"));
  EXPECT_THAT(with(",0,0,0,-1]", ",0,0,-1]"), HasSubstr("8 numbers, expected 9"));
  EXPECT_THAT(with("[1,0,0", "[2,0,0"), HasSubstr("not a rotation matrix"));
  EXPECT_THAT(with("[1,0,0", "[-1,0,0"), HasSubstr("not a rotation matrix"));
  EXPECT_THAT(with("[1,0,0", "[\"1\",0,0"), HasSubstr("expected a number"));
  EXPECT_THAT(with("800.25", "-800"), HasSubstr("behind the camera"));
  EXPECT_THAT(with("]}", R"(],"points3d":[1,2]})"), HasSubstr("2 numbers, expected 303"));
  EXPECT_THAT(FrameRefusal(Frame(1, Face(4, "\"truth\":5"))),
              HasSubstr("\"truth\" is 5, expected an object"));
  EXPECT_THAT(Refusal(Replaced(kHeader, "\"focal\":560.0,", "") + "\n" + Frame(0, Face(4, kTruth))),
              HasSubstr("a face has \"truth\" but the header has no \"focal\""));
}

TEST(TrackFile, MessagesAreOneShortLine) {
  const std::string message =
      FrameRefusal(R"({"frame":")" + std::string(5000, 'x') + R"(\n\u0007\u00e9","faces":[]})");
  EXPECT_LT(message.size(), 200u);
  EXPECT_THAT(message, Not(HasSubstr("\n")));
}

TEST(TrackFile, WhatIsWrittenReadsBack) {
  const std::string truth = R"("truth":{"rotation":[0.6,0.8,0,0.8,-0.6,0,0,0,-1],)"
                            R"("translation":[0.125,-3,812.5],"points3d":)" +
                            Points(303) + "}";
  const Track track = Read(Replaced(kHeader, "\"source\"", "\"noise_px\":0.5,\"source\"") + "\n" +
                           Frame(3, Face(1, truth)) + "\n" + Frame(4, Face(1, kTruth)) + "\n");
  std::stringstream out;
  WriteTrack(out, track);
  const Track again = ReadTrack(out, "copy.track.jsonl");
  EXPECT_EQ(again.header.focal, track.header.focal);
  EXPECT_EQ(again.header.noise_px, track.header.noise_px);
  EXPECT_EQ(again.header.source, track.header.source);
  ASSERT_EQ(again.frames.size(), 2u);
  EXPECT_EQ(again.frames[0].number, 3);
  const TrackFace& before = track.frames[0].faces[0];
  const TrackFace& after = again.frames[0].faces[0];
  EXPECT_EQ(after.points, before.points);
  EXPECT_EQ(after.truth->rotation, before.truth->rotation);
  EXPECT_EQ(after.truth->translation, before.truth->translation);
  EXPECT_EQ(after.truth->points3d, before.truth->points3d);
  EXPECT_TRUE(again.frames[1].faces[0].truth->points3d.empty());
}

// Whatever happens to the bytes of a track: it is read or refused with a place, nothing else.
TEST(TrackFile, SurvivesRandomDamage) {
  const std::string whole =
      std::string(kHeader) + "\n" + Frame(0, Face(1, kTruth)) + "\n" + Frame(1, Face(1, kTruth));
  auto random = n3ds::testing::TestRandom();
  const std::string alphabet = "0123456789-.e{}[]\",:nulltruefas \n\\\x01\xc3";
  int refused = 0;
  for (int round = 0; round < 2000; ++round) {
    std::string text = whole;
    const int changes = 1 + random.Int(0, 3);
    for (int i = 0; i < changes; ++i) {
      const std::size_t at = random.Next() % text.size();
      switch (random.Next() % 3) {
        case 0:
          text[at] = alphabet[random.Next() % alphabet.size()];
          break;
        case 1:
          text.erase(at, 1 + random.Next() % 20);
          break;
        default:
          text.insert(at, 1, alphabet[random.Next() % alphabet.size()]);
      }
    }
    const std::string message = Refusal(text);
    if (message.empty()) continue;
    ++refused;
    EXPECT_THAT(message, StartsWith("some/talk.track.jsonl:"));
  }
  EXPECT_GT(refused, 1000);
}

}  // namespace
}  // namespace n3ds::tool
