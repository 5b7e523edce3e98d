// quorin-detect: decoders, options, coordinate mapping, exit codes on bad
// input and results on real photos. Option refusals, drawing and JSON escapes
// no longer have cases of their own: no seeded fault reaches them and the
// command-line cases below run each path.

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <sstream>
#include <string>
#include <vector>

#include <sys/wait.h>

#include "Engine.h"
#include "Faces.h"
#include "ImageIo.h"
#include "Json.h"
#include "core/FaceData.h"
#include "quorin/JvwFile.h"
#include "support/DevData.h"
#include "support/SourceTree.h"
#include "Options.h"
#include "PhotoSession.h"

using namespace qcli;
using Bytes = std::vector<std::uint8_t>;

namespace {

// A deterministic picture with structure in both directions, so that a decoder
// that mixes up rows, columns or channels produces different pixels.
Image pattern(int w, int h, int channels) {
  Image im{w, h, channels, Bytes(static_cast<std::size_t>(w) * h * channels)};
  for (std::size_t i = 0; i < im.pixels.size(); ++i) {
    const std::size_t x = i / channels % w, y = i / channels / w, c = i % channels;
    im.pixels[i] = static_cast<std::uint8_t>((x * 7 + y * 13 + c * 85) & 0xFF);
  }
  return im;
}

Bytes pgmBytes(const Image& gray) {
  const std::string header = "P5\n" + std::to_string(gray.width) + " " + std::to_string(gray.height) + "\n255\n";
  Bytes out(header.begin(), header.end());
  out.insert(out.end(), gray.pixels.begin(), gray.pixels.end());
  return out;
}

std::string tempDir() {
  static const std::string dir = sourcetree::scratchDir("quorin_detect");
  return dir;
}

std::string writeTemp(const std::string& name, const Bytes& bytes) {
  const std::string path = tempDir() + "/" + name;
  sourcetree::writeText(path, std::string(bytes.begin(), bytes.end()));
  return path;
}

std::string shellQuote(const std::string& s) {
  std::string q = "'";
  for (char c : s) q += c == '\'' ? std::string("'\\''") : std::string(1, c);
  return q + "'";
}

struct CliRun {
  int status = -1;
  std::string out, err;
};

CliRun runCli(const std::vector<std::string>& args, const Bytes& input = {}) {
  static int counter = 0;
  const std::string base = writeTemp("run" + std::to_string(counter++), input);
  std::string cmd = shellQuote(QUORIN_DETECT_EXE);
  for (const auto& a : args) cmd += " " + shellQuote(a);
  cmd += " < " + shellQuote(base) + " > " + shellQuote(base + ".out") + " 2> " + shellQuote(base + ".err");
  const int rc = std::system(cmd.c_str());
  return {WIFEXITED(rc) ? WEXITSTATUS(rc) : 128 + (WIFSIGNALED(rc) ? WTERMSIG(rc) : 0),
          sourcetree::readText(base + ".out"), sourcetree::readText(base + ".err")};
}

bool contains(const std::string& text, const std::string& part) { return text.find(part) != std::string::npos; }

}  // namespace

TEST(ImageDecoding, ReadsPngAndPgmAsTheSamePictureWithRoundedLuma) {
  const Image rgb = pattern(37, 23, 3);
  EXPECT_EQ(decodeImage(encodePng(rgb)).pixels, rgb.pixels);
  EXPECT_EQ(toGray(decodeImage(pgmBytes(toGray(rgb)))).pixels, toGray(rgb).pixels);
  EXPECT_EQ(toGray(Image{3, 1, 3, {255, 0, 0, 0, 255, 0, 10, 20, 30}}).pixels, (Bytes{76, 150, 18}));
  EXPECT_THROW(savePng(rgb, tempDir() + "/no/such/dir/out.png"), ImageError);
}

TEST(OptionParsing, PicksTheEntryForTheModeOfTheRun) {
  const std::vector<std::pair<std::vector<std::string>, Entry>> entries = {
      {{"a.png"}, Entry::Detect},
      {{"--scaled", "a.png"}, Entry::DetectScaled},
      {{"--360", "a.png"}, Entry::Detect360High},
      {{"--360", "--scaled", "--annotate", "o.png", "a.png"}, Entry::Detect360HighScaled},
      {{"--360", "--raw", "8x8"}, Entry::Detect360Tracking},
      {{"--360", "--scaled", "--raw", "8x8"}, Entry::Detect360TrackingScaledOrnt},
  };
  for (const auto& e : entries) EXPECT_EQ(chooseEntry(parseOptions(e.first)), e.second) << e.first[0];
}

TEST(PhotoSession, FindsTheSmallFacesTheWorkFrameRuleLeavesOut) {
  const std::string photo = devdata::photo("tracking_faces_test.png");
  if (!devdata::exists(photo)) GTEST_SKIP() << devdata::missingNote();
  // The three people at a third of their size (faces of about 36 pixels) in a
  // 600 x 600 frame, where the C entry's smallest face is 75 pixels.
  const Image gray = toGray(loadImage(photo));
  Bytes frame(600 * 600, 128);
  for (int y = 0; y < gray.height / 3; ++y)
    for (int x = 0; x < gray.width / 3; ++x)
      frame[static_cast<std::size_t>(200 + y) * 600 + 100 + x] = gray.pixels[static_cast<std::size_t>(3 * y) * gray.width + 3 * x];
  Bytes copy = frame;
  EXPECT_EQ(EngineSession(Options{}).detect(copy, 600, 600).faces.size(), 0u);
  const FrameResult found = PhotoSession(24).detect(frame, 600, 600);
  ASSERT_EQ(found.faces.size(), 3u);
  for (const Face& f : found.faces) {
    EXPECT_TRUE(f.left >= 100 && f.right <= 300 && f.top >= 200 && f.bottom <= 316 && f.right - f.left < 60)
        << faceJson(f);
    EXPECT_TRUE(f.leftEye.x < f.rightEye.x && f.nose.y < f.leftMouthCorner.y) << faceJson(f);
  }
}

TEST(FaceMapping, UndoesEachRotationAndMapsTheScaledSpanOntoTheImage) {
  const int w = 50, h = 30;
  // The engine's clockwise turn of a pixel in the w x h frame, a quarter at a time.
  auto turn = [&](Point p, int rotation) {
    for (int fw = w, fh = h; rotation > 0; rotation -= 90, std::swap(fw, fh)) p = {fh - 1 - p.y, p.x};
    return p;
  };
  for (int rot : {0, 90, 180, 270}) {
    // A box over pixels x 10..19, y 5..11 and an eye at (12, 7) in the frame as given.
    const Point a = turn({10, 5}, rot), b = turn({19, 11}, rot);
    const Face turned{0, std::min(a.x, b.x), std::min(a.y, b.y), std::max(a.x, b.x) + 1, std::max(a.y, b.y) + 1,
                      turn({12, 7}, rot), {}, {}, {}, {}};
    const Face back = toImagePixels(turned, Coordinates::Frame, rot, w, h);
    EXPECT_EQ((std::vector<long long>{back.left, back.right, back.top, back.bottom, back.leftEye.x, back.leftEye.y}),
              (std::vector<long long>{10, 20, 5, 12, 12, 7}))
        << rot;
    // Scaled results are already on the frame's own axes: rotation plays no part.
    const Face f{0, -1000, -500, 1000, 0, {}, {}, {0, 1000}, {}, {}};
    const Face px = toImagePixels(f, Coordinates::Scaled, rot, 640, 480);
    EXPECT_EQ((std::vector<long long>{px.left, px.right, px.top, px.bottom, px.nose.x, px.nose.y}),
              (std::vector<long long>{0, 640, 120, 240, 320, 480}))
        << rot;
  }
}

TEST(CommandLine, BadInputEndsWithItsStatusAndAClearMessage) {
  const Bytes png = encodePng(pattern(64, 48, 3));
  const std::string cut = writeTemp("cut.png", Bytes(png.begin(), png.begin() + 60));
  const std::string text = writeTemp("notes.png", {'h', 'e', 'l', 'l', 'o'});
  const struct {
    std::vector<std::string> args;
    Bytes input;
    int status;
    std::vector<std::string> parts;  // in stderr, or in stdout for --help
    int lines;                       // of stdout, -1: not counted
  } cases[] = {
      {{"--help"}, {}, 0, {"--raw WxH"}, -1},
      {{"--mode", "7", "x.png"}, {}, 2, {"--mode"}, -1},
      {{}, {}, 2, {}, -1},
      // Each unreadable file still gets its JSON line.
      {{cut, text, tempDir() + "/missing.jpg"}, {}, 1, {"cut.png", "notes.png", "missing.jpg"}, 3},
      {{"--raw", "64x48"}, Bytes(64 * 24, 128), 1, {"truncated", "1536 of 3072"}, -1},
      {{"--raw", "64x48"}, {}, 1, {"no frames"}, -1},
      {{"--raw", "4000x1"}, Bytes(4000, 1), 1, {"elongated"}, -1},
      // The search on a stream runs in mode 0 (long side 240): 1000 x 4 shrinks to 240 x 0.
      {{"--360", "--raw", "1000x4"}, Bytes(4000, 1), 1, {"elongated"}, -1},
      {{"--jvw", tempDir() + "/no/such/dir/x.jvw", writeTemp("jvw.pgm", pgmBytes(toGray(pattern(64, 48, 3))))},
       {}, 1, {"QV JVW file open error"}, -1},
  };
  for (const auto& c : cases) {
    const CliRun r = runCli(c.args, c.input);
    SCOPED_TRACE(::testing::PrintToString(c.args) + "\n" + r.out + r.err);
    EXPECT_EQ(r.status, c.status);
    for (const std::string& part : c.parts) EXPECT_TRUE(contains(c.status == 0 ? r.out : r.err, part)) << part;
    if (c.lines >= 0) {
      EXPECT_EQ(std::count(r.out.begin(), r.out.end(), '\n'), c.lines);
    }
  }
}

TEST(CommandLine, ImagesAndRawFramesGiveOneJsonLineEach) {
  const std::string out = tempDir() + "/plain-annotated.png";
  CliRun r = runCli({"--annotate", out, writeTemp("plain.pgm", pgmBytes(toGray(pattern(160, 120, 3))))});
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(r.out.rfind("{\"file\":", 0), 0u);
  EXPECT_TRUE(contains(r.out, "\"width\":160,\"height\":120") && contains(r.out, "\"faces\":[")) << r.out;
  EXPECT_EQ(std::make_pair(loadImage(out).width, loadImage(out).height), std::make_pair(160, 120));

  // Three frames, then a tail of 100 bytes. Annotated frames go to stdout at
  // the stream's size, the JSON to its file.
  Bytes frames(3 * 96 * 64 + 100);
  const Image p = toGray(pattern(96, 64, 3));
  for (int k = 0; k < 3; ++k) std::copy(p.pixels.begin(), p.pixels.end(), frames.begin() + k * 96 * 64);
  const std::string json = tempDir() + "/frames.json";
  r = runCli({"--raw", "96x64", "--annotate-raw", "--json", json}, frames);
  EXPECT_EQ(r.status, 1) << r.err;
  EXPECT_TRUE(contains(r.err, "frame 3 has 100 of 6144")) << r.err;
  EXPECT_EQ(r.out.size(), 3u * 96 * 64);
  const std::string lines = sourcetree::readText(json);
  EXPECT_EQ(std::count(lines.begin(), lines.end(), '\n'), 3);
  EXPECT_EQ(lines.rfind("{\"frame\":0,", 0), 0u);
}

// The record file holds the faces of the JSON line in the same pixels; a name
// a record can't hold fails that image, and the others are still written.
TEST(JvwOutput, RecordsTheFacesOfTheJsonLine) {
  const std::string photo = devdata::photo("tracking_faces.jpg");
  if (!devdata::exists(photo)) GTEST_SKIP() << devdata::missingNote();
  const std::string odd = tempDir() + "/we\"ird{.jpg", jvw = tempDir() + "/faces.jvw";
  ASSERT_EQ(std::system(("cp " + shellQuote(photo) + " " + shellQuote(odd)).c_str()), 0);
  const CliRun r = runCli({"--jvw", jvw, odd, photo});
  EXPECT_EQ(r.status, 1);
  EXPECT_TRUE(contains(r.err, "can't be stored in a JVW record")) << r.err;

  const std::vector<FaceData> faces = JvwReader(jvw).readFaces();
  ASSERT_GE(faces.size(), 2u) << "the development photo shows three faces";
  const std::size_t own = r.out.find("{\"file\":\"" + photo + "\"");
  ASSERT_NE(own, std::string::npos) << r.out;
  const std::string line = r.out.substr(own);
  std::size_t rects = 0;
  for (std::size_t at = line.find("\"rect\""); at != std::string::npos; at = line.find("\"rect\"", at + 1)) ++rects;
  EXPECT_EQ(rects, faces.size());
  for (const FaceData& f : faces) {
    EXPECT_EQ(f.filePath(), photo);
    EXPECT_EQ(f.landmarks().size(), 5u);
    const Rect2<int32_t>& rect = f.faceRect();
    const Point2<float> eye = f.landmark("leftEye");
    std::ostringstream expected;
    expected << R"({"left":)" << rect.left << R"(,"top":)" << rect.top << R"(,"right":)" << rect.right
             << R"(,"bottom":)" << rect.bottom << R"(},"landmarks":{"leftEye":[)" << static_cast<long>(eye.x) << ","
             << static_cast<long>(eye.y) << "]";
    EXPECT_TRUE(contains(line, expected.str())) << expected.str();
  }
}
