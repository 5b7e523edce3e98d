// Tests of quorin-detect: its decoders on damaged files, its options, the
// mapping of engine coordinates back onto the image, the drawing, the JSON text,
// the raw frame reader, and the program's exit codes on bad input.

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <random>
#include <sstream>
#include <string>
#include <thread>
#include <vector>

#include <sys/wait.h>
#include <unistd.h>

#include <stb_image_write.h>

#include "Annotate.h"
#include "Engine.h"
#include "Faces.h"
#include "ImageIo.h"
#include "Json.h"
#include "core/FaceData.h"
#include "quorin/JvwFile.h"
#include "support/DevData.h"
#include "Options.h"
#include "RawStream.h"
#include "TrackerSession.h"

using namespace qcli;

namespace {

// A deterministic picture with structure in both directions, so that a decoder
// that mixes up rows, columns or channels produces different pixels.
Image pattern(int w, int h, int channels) {
  Image im;
  im.width = w;
  im.height = h;
  im.channels = channels;
  im.pixels.resize(static_cast<std::size_t>(w) * h * channels);
  for (int y = 0; y < h; ++y)
    for (int x = 0; x < w; ++x)
      for (int c = 0; c < channels; ++c)
        im.pixels[(static_cast<std::size_t>(y) * w + x) * channels + c] =
            static_cast<std::uint8_t>((x * 7 + y * 13 + c * 85) & 0xFF);
  return im;
}

std::vector<std::uint8_t> pgmBytes(const Image& gray) {
  std::string header = "P5\n" + std::to_string(gray.width) + " " + std::to_string(gray.height) + "\n255\n";
  std::vector<std::uint8_t> out(header.begin(), header.end());
  out.insert(out.end(), gray.pixels.begin(), gray.pixels.end());
  return out;
}

void append(void* ctx, void* data, int size) {
  auto* out = static_cast<std::vector<std::uint8_t>*>(ctx);
  out->insert(out->end(), static_cast<std::uint8_t*>(data), static_cast<std::uint8_t*>(data) + size);
}

std::vector<std::uint8_t> jpegBytes(const Image& im) {
  std::vector<std::uint8_t> out;
  stbi_write_jpg_to_func(append, &out, im.width, im.height, im.channels, im.pixels.data(), 90);
  return out;
}

std::string tempDir() {
  static std::string dir = [] {
    std::string templ = ::testing::TempDir() + "quorin-detect-XXXXXX";
    std::vector<char> buf(templ.begin(), templ.end());
    buf.push_back('\0');
    const char* made = mkdtemp(buf.data());
    return std::string(made ? made : "/tmp");
  }();
  return dir;
}

std::string writeTemp(const std::string& name, const std::vector<std::uint8_t>& bytes) {
  std::string path = tempDir() + "/" + name;
  std::ofstream(path, std::ios::binary).write(reinterpret_cast<const char*>(bytes.data()),
                                              static_cast<std::streamsize>(bytes.size()));
  return path;
}

std::string readText(const std::string& path) {
  std::ifstream in(path, std::ios::binary);
  std::stringstream ss;
  ss << in.rdbuf();
  return ss.str();
}

// Every outcome of decoding damaged bytes must be a clean image or ImageError.
void expectDecodesOrRefuses(const std::vector<std::uint8_t>& bytes) {
  try {
    Image im = decodeImage(bytes);
    ASSERT_GT(im.width, 0);
    ASSERT_GT(im.height, 0);
    ASSERT_EQ(im.channels, 3);
    ASSERT_EQ(im.pixels.size(), static_cast<std::size_t>(im.width) * im.height * 3);
  } catch (const ImageError&) {
  }
}

// The engine's clockwise turn of a pixel in a w x h frame.
Point turn(Point p, int rotation, int w, int h) {
  switch (rotation) {
    case 90: return {h - 1 - p.y, p.x};
    case 180: return {w - 1 - p.x, h - 1 - p.y};
    case 270: return {p.y, w - 1 - p.x};
    default: return p;
  }
}

struct CliRun {
  int status = -1;
  std::string out;
  std::string err;
};

std::string shellQuote(const std::string& s) {
  std::string q = "'";
  for (char c : s) q += c == '\'' ? std::string("'\\''") : std::string(1, c);
  return q + "'";
}

CliRun runCli(const std::vector<std::string>& args, const std::vector<std::uint8_t>& input = {}) {
  static int counter = 0;
  const std::string base = tempDir() + "/run" + std::to_string(counter++);
  writeTemp("run" + std::to_string(counter - 1) + ".in", input);
  std::string cmd = shellQuote(QUORIN_DETECT_EXE);
  for (const auto& a : args) cmd += " " + shellQuote(a);
  cmd += " < " + shellQuote(base + ".in") + " > " + shellQuote(base + ".out") + " 2> " + shellQuote(base + ".err");
  int rc = std::system(cmd.c_str());
  CliRun r;
  r.status = WIFEXITED(rc) ? WEXITSTATUS(rc) : 128 + (WIFSIGNALED(rc) ? WTERMSIG(rc) : 0);
  r.out = readText(base + ".out");
  r.err = readText(base + ".err");
  return r;
}

// Runs past the engine are only meaningful when a session opens in this build.
#define SKIP_IF_ENGINE_CANNOT_START(run)                                         \
  if ((run).status == 3 && (run).err.find("initialisation") != std::string::npos) \
  GTEST_SKIP() << "the engine does not start in this build: " << (run).err

}  // namespace

// ---------------------------------------------------------------------------

TEST(ImageDecoding, ReadsPngJpegAndPgmAsTheSamePicture) {
  Image rgb = pattern(37, 23, 3);
  Image gray = toGray(rgb);
  Image fromPng = decodeImage(encodePng(rgb));
  EXPECT_EQ(fromPng.pixels, rgb.pixels);
  Image fromPgm = decodeImage(pgmBytes(gray));
  ASSERT_EQ(fromPgm.width, 37);
  ASSERT_EQ(fromPgm.height, 23);
  EXPECT_EQ(toGray(fromPgm).pixels, gray.pixels);
  Image fromJpeg = decodeImage(jpegBytes(rgb));
  ASSERT_EQ(fromJpeg.width, 37);
  ASSERT_EQ(fromJpeg.height, 23);
}

TEST(ImageDecoding, GrayUsesRoundedLumaWeights) {
  Image im;
  im.width = 3;
  im.height = 1;
  im.channels = 3;
  im.pixels = {255, 0, 0, 0, 255, 0, 10, 20, 30};
  Image g = toGray(im);
  ASSERT_EQ(g.channels, 1);
  EXPECT_EQ(g.pixels, (std::vector<std::uint8_t>{76, 150, 18}));
}

TEST(ImageDecoding, RefusesEmptyGarbageAndForgedHeaders) {
  EXPECT_THROW(decodeImage({}), ImageError);
  std::vector<std::uint8_t> garbage(500);
  std::mt19937 rng(7);
  for (auto& b : garbage) b = static_cast<std::uint8_t>(rng());
  EXPECT_THROW(decodeImage(garbage), ImageError);
  // A header that asks for far more pixels than the file holds or we accept.
  std::string huge = "P5\n100000 100000\n255\n";
  EXPECT_THROW(decodeImage(std::vector<std::uint8_t>(huge.begin(), huge.end())), ImageError);
  std::string big = "P5\n16000 16000\n255\n";  // within the side limit, over the pixel limit
  EXPECT_THROW(decodeImage(std::vector<std::uint8_t>(big.begin(), big.end())), ImageError);
  std::string zero = "P5\n0 10\n255\n";
  EXPECT_THROW(decodeImage(std::vector<std::uint8_t>(zero.begin(), zero.end())), ImageError);
}

TEST(ImageDecoding, SurvivesEveryTruncationAndCorruptedBytes) {
  Image rgb = pattern(48, 32, 3);
  std::mt19937 rng(12345);
  for (const auto& good : {encodePng(rgb), jpegBytes(rgb), pgmBytes(toGray(rgb))}) {
    for (std::size_t len = 0; len < good.size(); len += 1 + len / 16)
      expectDecodesOrRefuses(std::vector<std::uint8_t>(good.begin(), good.begin() + static_cast<long>(len)));
    for (int trial = 0; trial < 150; ++trial) {
      std::vector<std::uint8_t> bad = good;
      const int flips = 1 + static_cast<int>(rng() % 8);
      for (int k = 0; k < flips; ++k) bad[rng() % bad.size()] ^= static_cast<std::uint8_t>(1 + rng() % 255);
      expectDecodesOrRefuses(bad);
    }
  }
}

TEST(ImageDecoding, FileErrorsNameTheFile) {
  try {
    loadImage(tempDir() + "/does-not-exist.png");
    FAIL() << "no error";
  } catch (const ImageError& e) {
    EXPECT_NE(std::string(e.what()).find("does-not-exist.png"), std::string::npos);
    EXPECT_NE(std::string(e.what()).find("No such file"), std::string::npos);
  }
  EXPECT_THROW(savePng(pattern(4, 4, 3), tempDir() + "/no/such/dir/out.png"), ImageError);
}

// ---------------------------------------------------------------------------

TEST(OptionParsing, DefaultsDependOnTheInputAndInlineValuesAndDashFilesAreRead) {
  Options images = parseOptions({"a.png", "b.jpg"});
  EXPECT_EQ(images.effectiveMode(), 2);
  EXPECT_EQ(images.maxFaces, 100);
  Options raw = parseOptions({"--raw", "320x240"});
  EXPECT_EQ(raw.effectiveMode(), 1);
  EXPECT_EQ(raw.rawHeight, 240);
  const Options o = parseOptions({"--mode=0", "--rotation=270", "--scaled", "--", "-odd.png", "--mode"});
  EXPECT_EQ(o.mode, 0);
  EXPECT_EQ(o.rotation, 270);
  EXPECT_TRUE(o.scaled);
  EXPECT_EQ(o.images, (std::vector<std::string>{"-odd.png", "--mode"}));
}

TEST(OptionParsing, RefusesBadValues) {
  for (auto args : std::vector<std::vector<std::string>>{
           {"--mode", "3", "a.png"},        {"--mode", "1x", "a.png"},      {"--mode", "", "a.png"},
           {"--rotation", "45", "a.png"},   {"--rotation", "-90", "a.png"}, {"--rotation", "360", "a.png"},
           {"--max-faces", "0", "a.png"},   {"--max-faces", "101", "a.png"},
           {"--raw", "0x10"},               {"--raw", "10x"},               {"--raw", "x10"},
           {"--raw", "99999x10"},           {"--raw", "10x10x10"},          {"--raw", "99999999999999x1"},
           {"--mode"},                      {"--bogus", "a.png"},           {"--scaled=1", "a.png"},
           {"--tracker", "KF", "--raw", "8x8"}, {"--tracker", "", "--raw", "8x8"}, {"--tracker"},
       }) {
    EXPECT_THROW(parseOptions(args), UsageError) << args[0] << " " << (args.size() > 1 ? args[1] : "");
  }
}

TEST(OptionParsing, RefusesContradictions) {
  for (auto args : std::vector<std::vector<std::string>>{
           {},
           {"--raw", "8x8", "a.png"},
           {"--raw", "8x8", "--annotate", "o.png"},
           {"--annotate-raw", "a.png"},
           {"--annotate", "o.png", "a.png", "b.png"},
           {"--360", "--rotation", "90", "a.png"},
           {"--360", "--mode", "1", "a.png"},
           {"--360", "--annotate", "o.png", "a.png"},
           {"--360", "--raw", "8x8", "--annotate-raw"},
           {"--jvw", "", "a.png"},
           {"--360", "--jvw", "f.jvw", "a.png"},
           {"--jvw", "f.txt", "--json", "f.txt", "a.png"},
           {"--tracker", "kf", "a.png"},
           {"--tracker", "pf", "--raw", "8x8", "--360"},
           {"--tracker", "pf", "--raw", "8x8", "--scaled"},
           {"--tracker", "cpf", "--raw", "8x8", "--mode", "1"},
           {"--tracker", "simple", "--raw", "8x8", "--rotation", "90"},
       }) {
    EXPECT_THROW(parseOptions(args), UsageError) << ::testing::PrintToString(args);
  }
  EXPECT_EQ(parseOptions({"--tracker=cpf", "--raw", "8x8"}).tracker, 4);
  EXPECT_EQ(parseOptions({"--raw", "8x8", "--tracker", "simple", "--rotation", "0"}).tracker, 1);
  EXPECT_NO_THROW(parseOptions({"--360", "--scaled", "--annotate", "o.png", "a.png"}));
  EXPECT_EQ(parseOptions({"--jvw=f.jvw", "--raw", "8x8"}).jvwPath, "f.jvw");
  EXPECT_TRUE(parseOptions({"--help", "--bogus"}).help);
}

TEST(OptionParsing, EachFlagPicksItsEntryPoint) {
  auto entry = [](std::vector<std::string> args) { return chooseEntry(parseOptions(args)); };
  EXPECT_EQ(entry({"a.png"}), Entry::Detect);
  EXPECT_EQ(entry({"--scaled", "a.png"}), Entry::DetectScaled);
  EXPECT_EQ(entry({"--360", "a.png"}), Entry::Detect360High);
  EXPECT_EQ(entry({"--360", "--scaled", "a.png"}), Entry::Detect360HighScaled);
  EXPECT_EQ(entry({"--360", "--raw", "8x8"}), Entry::Detect360Tracking);
  EXPECT_EQ(entry({"--360", "--scaled", "--raw", "8x8"}), Entry::Detect360TrackingScaledOrnt);
  EXPECT_EQ(entryCoordinates(Entry::Detect360Tracking), Coordinates::Frame);
  EXPECT_EQ(entryCoordinates(Entry::Detect360HighScaled), Coordinates::Scaled);
}

TEST(FrameChecks, RefusesFramesTheEngineWouldShrinkToNothing) {
  Options high = parseOptions({"a.png"});
  EXPECT_EQ(frameProblem(high, 640, 480), "");
  EXPECT_EQ(frameProblem(high, 640, 1), "");  // not resized at all in mode 2
  EXPECT_NE(frameProblem(high, 2000, 2), "");  // 640/2000*2 < 1
  Options tracking360 = parseOptions({"--360", "--raw", "8x8"});
  // the search runs in mode 0 (long side 240): 1000x4 shrinks to 240x0
  EXPECT_NE(frameProblem(tracking360, 1000, 4), "");
  EXPECT_EQ(frameProblem(parseOptions({"--360", "a.png"}), 1000, 4), "");
  EXPECT_NE(frameProblem(high, 16384, 16384), "");
  EXPECT_NE(frameProblem(high, 0, 10), "");
}

// ---------------------------------------------------------------------------

TEST(FaceMapping, UndoesEachRotationOntoTheSamePixels) {
  const int w = 50, h = 30;
  // A box over pixels x 10..19, y 5..11 and an eye at (12, 7) in the frame as given.
  const Point corner0{10, 5}, corner1{19, 11}, eye{12, 7};
  for (int rot : {0, 90, 180, 270}) {
    Point a = turn(corner0, rot, w, h), b = turn(corner1, rot, w, h), e = turn(eye, rot, w, h);
    Face turned;
    turned.left = std::min(a.x, b.x);
    turned.right = std::max(a.x, b.x) + 1;
    turned.top = std::min(a.y, b.y);
    turned.bottom = std::max(a.y, b.y) + 1;
    turned.leftEye = e;
    Face back = toImagePixels(turned, Coordinates::Frame, rot, w, h);
    EXPECT_EQ(back.left, 10) << rot;
    EXPECT_EQ(back.right, 20) << rot;
    EXPECT_EQ(back.top, 5) << rot;
    EXPECT_EQ(back.bottom, 12) << rot;
    EXPECT_EQ(back.leftEye.x, 12) << rot;
    EXPECT_EQ(back.leftEye.y, 7) << rot;
  }
}

TEST(FaceMapping, ScaledSpanMapsOntoTheWholeImage) {
  Face f;
  f.left = -1000;
  f.right = 1000;
  f.top = -500;
  f.bottom = 0;
  f.nose = {0, 1000};
  // Scaled results are already on the frame's own axes: rotation plays no part.
  for (int rot : {0, 90}) {
    Face px = toImagePixels(f, Coordinates::Scaled, rot, 640, 480);
    EXPECT_EQ(px.left, 0);
    EXPECT_EQ(px.right, 640);
    EXPECT_EQ(px.top, 120);
    EXPECT_EQ(px.bottom, 240);
    EXPECT_EQ(px.nose.x, 320);
    EXPECT_EQ(px.nose.y, 480);
  }
}

// ---------------------------------------------------------------------------

TEST(Annotation, DrawsTheBoxAndLeavesTheRestAlone) {
  Image im = pattern(200, 100, 3);
  const Image before = im;
  Face f;
  f.left = 50; f.top = 20; f.right = 120; f.bottom = 80;
  f.leftEye = {70, 40}; f.rightEye = {100, 40}; f.nose = {85, 55};
  f.leftMouthCorner = {72, 68}; f.rightMouthCorner = {98, 68};
  drawFaces(im, {f});
  auto px = [&](const Image& i, int x, int y) { return &i.pixels[(static_cast<std::size_t>(y) * i.width + x) * 3]; };
  EXPECT_EQ(px(im, 60, 20)[1], 230);  // top edge is green
  EXPECT_EQ(px(im, 60, 20)[0], 0);
  EXPECT_EQ(px(im, 119, 50)[1], 230);  // right edge, inside the box
  EXPECT_EQ(px(im, 70, 40)[0], 255);   // eye mark
  for (auto [x, y] : {std::pair<int, int>{5, 5}, {190, 95}})
    for (int c = 0; c < 3; ++c) EXPECT_EQ(px(im, x, y)[c], px(before, x, y)[c]) << x << "," << y;
}

TEST(Annotation, ClipsAnyCoordinatesToTheImage) {
  for (int channels : {1, 3}) {
    Image im = pattern(31, 17, channels);
    int block[17];
    std::vector<Face> faces;
    for (int i = 0; i < 17; ++i) block[i] = (i % 3 == 0) ? INT_MIN : (i % 3 == 1 ? INT_MAX : -5);
    faces.push_back(faceFromBlock(block));
    Face inverted;
    inverted.left = 40; inverted.right = -40; inverted.top = 30; inverted.bottom = -30;
    inverted.nose = {31, 17}; inverted.leftEye = {-1, -1};
    faces.push_back(inverted);
    // Mapping extreme values must neither wrap (UBSan) nor escape the clip.
    for (int rot : {0, 90, 180, 270}) {
      faces.push_back(toImagePixels(faces[0], Coordinates::Scaled, rot, 31, 17));
      faces.push_back(toImagePixels(faces[0], Coordinates::Frame, rot, 31, 17));
    }
    drawFaces(im, faces);
    EXPECT_EQ(im.pixels.size(), static_cast<std::size_t>(31 * 17 * channels));
  }
  Image broken = pattern(4, 4, 3);
  broken.pixels.resize(10);
  EXPECT_THROW(drawFaces(broken, {Face{}}), ImageError);
}

// ---------------------------------------------------------------------------

TEST(JsonText, EscapesEveryFileNameIntoValidJson) {
  EXPECT_EQ(jsonString("a\"b\\c"), "\"a\\\"b\\\\c\"");
  EXPECT_EQ(jsonString(std::string("x\n\t\x01\x7f", 5)), "\"x\\n\\t\\u0001\\u007f\"");
  EXPECT_EQ(jsonString("caf\xc3\xa9 \xe2\x82\xac \xf0\x9f\x98\x80"), "\"caf\xc3\xa9 \xe2\x82\xac \xf0\x9f\x98\x80\"");
  // Stray continuation bytes, overlong forms, surrogates, cut sequences.
  EXPECT_EQ(jsonString("\x80"), "\"\\ufffd\"");
  EXPECT_EQ(jsonString("\xc0\x80"), "\"\\ufffd\\ufffd\"");
  EXPECT_EQ(jsonString("\xed\xa0\x80"), "\"\\ufffd\\ufffd\\ufffd\"");
  EXPECT_EQ(jsonString("ab\xe2\x82"), "\"ab\\ufffd\\ufffd\"");
  EXPECT_EQ(jsonString("\xf4\x90\x80\x80"), "\"\\ufffd\\ufffd\\ufffd\\ufffd\"");
  EXPECT_EQ(jsonString(std::string("\0z", 2)), "\"\\u0000z\"");
}

TEST(JsonText, FaceCarriesRectangleFiveNamedLandmarksAndRoll) {
  int block[17];
  for (int i = 0; i < 17; ++i) block[i] = i - 8;
  EXPECT_EQ(faceJson(faceFromBlock(block)),
            "{\"rect\":{\"left\":-3,\"top\":-5,\"right\":-2,\"bottom\":-4},\"landmarks\":{"
            "\"leftEye\":[-1,0],\"rightEye\":[1,2],\"nose\":[7,8],\"leftMouthCorner\":[3,4],"
            "\"rightMouthCorner\":[5,6]},\"roll\":-8}");
  EXPECT_EQ(facesJson({}), "[]");
  const std::string two = facesJson({Face{}, Face{}});
  EXPECT_EQ(std::count(two.begin(), two.end(), '{'), 6);
}

// ---------------------------------------------------------------------------

TEST(RawFrames, SplitsTheStreamAndEndsCleanlyOrReportsATruncatedTail) {
  for (std::size_t tail : {0, 7}) {
    std::vector<std::uint8_t> data(6 * 4 * 2 + tail);
    for (std::size_t i = 0; i < data.size(); ++i) data[i] = static_cast<std::uint8_t>(i);
    std::FILE* f = fmemopen(data.data(), data.size(), "rb");
    ASSERT_NE(f, nullptr);
    RawFrameReader reader(f, 6, 4);
    std::vector<std::uint8_t> frame;
    ASSERT_EQ(reader.next(frame), RawFrameReader::Status::Frame);
    EXPECT_EQ(frame.front(), 0);
    ASSERT_EQ(reader.next(frame), RawFrameReader::Status::Frame);
    EXPECT_EQ(frame.front(), 24);
    EXPECT_EQ(frame.back(), 47);
    if (tail == 0) {
      EXPECT_EQ(reader.next(frame), RawFrameReader::Status::End);
    } else {
      ASSERT_EQ(reader.next(frame), RawFrameReader::Status::Truncated);
      EXPECT_EQ(reader.partialBytes(), tail);
    }
    std::fclose(f);
  }
  std::FILE* empty = std::tmpfile();
  RawFrameReader none(empty, 3, 3);
  std::vector<std::uint8_t> frame;
  EXPECT_EQ(none.next(frame), RawFrameReader::Status::End);
  std::fclose(empty);
}

TEST(RawFrames, JoinsAFrameThatArrivesInPieces) {
  int fds[2];
  ASSERT_EQ(pipe(fds), 0);
  std::thread writer([fd = fds[1]] {
    std::vector<std::uint8_t> chunk(1000, 9);
    for (int i = 0; i < 10; ++i) {
      if (write(fd, chunk.data(), chunk.size()) != static_cast<ssize_t>(chunk.size())) break;
      usleep(1000);
    }
    close(fd);
  });
  std::FILE* f = fdopen(fds[0], "rb");
  RawFrameReader reader(f, 100, 50);
  std::vector<std::uint8_t> frame;
  EXPECT_EQ(reader.next(frame), RawFrameReader::Status::Frame);
  EXPECT_EQ(reader.next(frame), RawFrameReader::Status::Frame);
  EXPECT_EQ(reader.next(frame), RawFrameReader::Status::End);
  writer.join();
  std::fclose(f);
}

// ---------------------------------------------------------------------------

TEST(CommandLine, HelpAndUsageErrors) {
  CliRun help = runCli({"--help"});
  EXPECT_EQ(help.status, 0);
  EXPECT_NE(help.out.find("--raw WxH"), std::string::npos);
  CliRun bad = runCli({"--mode", "7", "x.png"});
  EXPECT_EQ(bad.status, 2);
  EXPECT_NE(bad.err.find("--mode"), std::string::npos);
  EXPECT_EQ(runCli({}).status, 2);
}

TEST(CommandLine, UnreadableAndCorruptFilesFailWithTheirNames) {
  std::vector<std::uint8_t> png = encodePng(pattern(64, 48, 3));
  std::string cut = writeTemp("cut.png", std::vector<std::uint8_t>(png.begin(), png.begin() + 60));
  std::string text = writeTemp("notes.png", {'h', 'e', 'l', 'l', 'o'});
  std::string missing = tempDir() + "/missing.jpg";
  CliRun r = runCli({cut, text, missing});
  EXPECT_EQ(r.status, 1) << r.err;
  for (const char* name : {"cut.png", "notes.png", "missing.jpg"}) {
    EXPECT_NE(r.err.find(name), std::string::npos) << name;
    EXPECT_NE(r.out.find(name), std::string::npos) << name;  // one JSON line each, with "error"
  }
  EXPECT_EQ(std::count(r.out.begin(), r.out.end(), '\n'), 3);
}

TEST(CommandLine, RawStreamOfTheWrongSizeOrEmptyFails) {
  CliRun half = runCli({"--raw", "64x48"}, std::vector<std::uint8_t>(64 * 24, 128));
  EXPECT_EQ(half.status, 1);
  EXPECT_NE(half.err.find("truncated"), std::string::npos) << half.err;
  EXPECT_NE(half.err.find("1536 of 3072"), std::string::npos) << half.err;
  CliRun empty = runCli({"--raw", "64x48"});
  EXPECT_EQ(empty.status, 1);
  EXPECT_NE(empty.err.find("no frames"), std::string::npos) << empty.err;
  CliRun thin = runCli({"--raw", "4000x1"}, std::vector<std::uint8_t>(4000, 1));
  EXPECT_EQ(thin.status, 1);
  EXPECT_NE(thin.err.find("elongated"), std::string::npos) << thin.err;
}

TEST(CommandLine, GoodImageGivesOneJsonLineAndAnAnnotation) {
  std::string pgm = writeTemp("plain.pgm", pgmBytes(toGray(pattern(160, 120, 3))));
  std::string out = tempDir() + "/plain-annotated.png";
  CliRun r = runCli({"--annotate", out, pgm});
  SKIP_IF_ENGINE_CANNOT_START(r);
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(r.out.rfind("{\"file\":", 0), 0u);
  EXPECT_NE(r.out.find("\"width\":160,\"height\":120"), std::string::npos);
  EXPECT_NE(r.out.find("\"faces\":["), std::string::npos);
  Image annotated = loadImage(out);
  EXPECT_EQ(annotated.width, 160);
  EXPECT_EQ(annotated.height, 120);
}

TEST(CommandLine, RawStreamGivesOneLinePerFrameThenReportsTruncation) {
  std::vector<std::uint8_t> frames(3 * 96 * 64 + 100);
  Image p = toGray(pattern(96, 64, 3));
  for (int k = 0; k < 3; ++k) std::copy(p.pixels.begin(), p.pixels.end(), frames.begin() + k * 96 * 64);
  CliRun r = runCli({"--raw", "96x64"}, frames);
  SKIP_IF_ENGINE_CANNOT_START(r);
  EXPECT_EQ(r.status, 1) << r.err;
  EXPECT_NE(r.err.find("frame 3 has 100 of 6144"), std::string::npos) << r.err;
  EXPECT_EQ(std::count(r.out.begin(), r.out.end(), '\n'), 3);
  EXPECT_EQ(r.out.rfind("{\"frame\":0,", 0), 0u);
}

TEST(CommandLine, AnnotatedRawFramesKeepTheStreamSize) {
  std::vector<std::uint8_t> frames(2 * 80 * 60, 100);
  std::string json = tempDir() + "/frames.json";
  CliRun r = runCli({"--raw", "80x60", "--annotate-raw", "--json", json}, frames);
  SKIP_IF_ENGINE_CANNOT_START(r);
  ASSERT_EQ(r.status, 0) << r.err;
  EXPECT_EQ(r.out.size(), frames.size());
  std::string lines = readText(json);
  EXPECT_EQ(std::count(lines.begin(), lines.end(), '\n'), 2);
}

// The rectangles of each JSON line of a raw run, as left, top, right, bottom.
std::vector<std::vector<std::vector<long long>>> rectsPerLine(const std::string& out) {
  std::vector<std::vector<std::vector<long long>>> lines;
  std::istringstream in(out);
  std::string line;
  while (std::getline(in, line)) {
    lines.emplace_back();
    for (std::size_t at = line.find("\"rect\""); at != std::string::npos; at = line.find("\"rect\"", at + 1)) {
      std::vector<long long> r;
      std::size_t p = at;
      for (const char* key : {"\"left\":", "\"top\":", "\"right\":", "\"bottom\":"}) {
        p = line.find(key, p) + std::strlen(key);
        r.push_back(std::atoll(line.c_str() + p));
      }
      lines.back().push_back(r);
    }
  }
  return lines;
}

TEST(TrackerOption, FindsTheConfigurationObjectInTheLibrarysText) {
  struct Case {
    const char* text;
    const char* expected;
  };
  const Case cases[] = {
      {R"({"detection":{"faceRects":{"a":{"b":1}},"faceParts":{}}})", R"({"a":{"b":1}})"},
      {R"({"note":"\"faceRects\": {x}","faceRects" : {"s":"}{"}})", R"({"s":"}{"})"},
      {R"({"faceRects":3,"inner":{"faceRects":{}}})", "{}"},
      {R"({"faceRects":{"open":1)", ""},
      {R"({"faceParts":{}})", ""},
  };
  for (const Case& c : cases) EXPECT_EQ(jsonObjectMember(c.text, "faceRects"), c.expected) << c.text;
}

// The Kalman tracker through FaceDetector sees the frames as the C API's
// tracking mode does, so both report the same faces; the particle trackers run
// on the same path.
TEST(TrackerOption, KalmanThroughTheDetectorClassMatchesTheTrackingMode) {
  const std::string photo = devdata::photo("tracking_faces.jpg");
  if (!devdata::exists(photo)) GTEST_SKIP() << devdata::missingNote();
  const Image gray = toGray(loadImage(photo));
  std::vector<std::uint8_t> frames;
  for (int k = 0; k < 3; ++k) frames.insert(frames.end(), gray.pixels.begin(), gray.pixels.end());
  const std::string size = std::to_string(gray.width) + "x" + std::to_string(gray.height);

  CliRun api = runCli({"--raw", size}, frames);
  SKIP_IF_ENGINE_CANNOT_START(api);
  ASSERT_EQ(api.status, 0) << api.err;
  CliRun kf = runCli({"--raw", size, "--tracker", "kf"}, frames);
  ASSERT_EQ(kf.status, 0) << kf.err;
  const auto expected = rectsPerLine(api.out), got = rectsPerLine(kf.out);
  ASSERT_EQ(got.size(), 3u);
  ASSERT_EQ(expected.size(), 3u);
  ASSERT_GE(expected[0].size(), 1u) << "the tracking mode finds a face in the development photo";
  for (std::size_t k = 0; k < 3; ++k) {
    auto a = expected[k], b = got[k];
    ASSERT_EQ(a.size(), b.size()) << "frame " << k;
    std::sort(a.begin(), a.end());
    std::sort(b.begin(), b.end());
    // Both scale back from the 320 work frame, each with its own rounding.
    for (std::size_t i = 0; i < a.size(); ++i)
      for (std::size_t e = 0; e < 4; ++e) EXPECT_NEAR(a[i][e], b[i][e], 2) << "frame " << k << " face " << i;
  }
  for (const char* name : {"simple", "pf", "cpf"}) {
    CliRun r = runCli({"--raw", size, "--tracker", name}, frames);
    EXPECT_EQ(r.status, 0) << name << ": " << r.err;
    EXPECT_EQ(rectsPerLine(r.out).size(), 3u) << name;
    EXPECT_GE(rectsPerLine(r.out)[0].size(), 1u) << name << ": a new face is found by the whole-frame search";
  }
}

// ---------------------------------------------------------------------------
// The record file of real detections: the faces of the JSON line, in the same
// pixels, read back through JvwReader and written again byte for byte.
TEST(JvwOutput, RecordsTheFacesOfTheJsonLineAndRoundTrips) {
  const std::string photo = devdata::photo("tracking_faces.jpg");
  if (!devdata::exists(photo)) GTEST_SKIP() << devdata::missingNote();
  const std::string jvw = tempDir() + "/faces.jvw";
  CliRun r = runCli({"--jvw", jvw, photo});
  SKIP_IF_ENGINE_CANNOT_START(r);
  ASSERT_EQ(r.status, 0) << r.err;

  JvwReader reader(jvw);
  const std::vector<FaceData> faces = reader.readFaces();
  ASSERT_GE(faces.size(), 2u) << "the development photo shows three faces";
  std::size_t rects = 0;
  for (std::size_t at = r.out.find("\"rect\""); at != std::string::npos; at = r.out.find("\"rect\"", at + 1)) ++rects;
  EXPECT_EQ(rects, faces.size());
  for (const FaceData& f : faces) {
    EXPECT_EQ(f.filePath(), photo);
    const Rect2<int32_t>& rect = f.faceRect();
    const std::string jsonRect = "{\"left\":" + std::to_string(rect.left) + ",\"top\":" + std::to_string(rect.top) +
                                 ",\"right\":" + std::to_string(rect.right) + ",\"bottom\":" +
                                 std::to_string(rect.bottom) + "}";
    EXPECT_NE(r.out.find(jsonRect), std::string::npos) << jsonRect;
    const Point2<float> eye = f.landmark("leftEye");
    const std::string jsonEye = "\"leftEye\":[" + std::to_string(static_cast<long>(eye.x)) + "," +
                                std::to_string(static_cast<long>(eye.y)) + "]";
    EXPECT_NE(r.out.find(jsonEye), std::string::npos) << jsonEye;
    EXPECT_EQ(f.landmarks().size(), 5u);
  }

  const std::string again = tempDir() + "/faces-again.jvw";
  JvwWriter writer(again);
  writer.writeFaces(faces);
  EXPECT_EQ(readText(again), readText(jvw));
}

TEST(JvwOutput, UnwritableFileAndUnstorableNamesFailClearly) {
  const std::string pgm = writeTemp("jvw-plain.pgm", pgmBytes(toGray(pattern(64, 48, 3))));
  CliRun nowhere = runCli({"--jvw", tempDir() + "/no/such/dir/x.jvw", pgm});
  EXPECT_EQ(nowhere.status, 1);
  EXPECT_NE(nowhere.err.find("QV JVW file open error"), std::string::npos) << nowhere.err;

  const std::string photo = devdata::photo("tracking_faces.jpg");
  if (!devdata::exists(photo)) GTEST_SKIP() << devdata::missingNote();
  const std::string odd = tempDir() + "/we\"ird{.jpg";
  ASSERT_EQ(std::system(("cp " + shellQuote(photo) + " " + shellQuote(odd)).c_str()), 0);
  const std::string jvw = tempDir() + "/odd.jvw";
  CliRun r = runCli({"--jvw", jvw, odd, photo});
  SKIP_IF_ENGINE_CANNOT_START(r);
  EXPECT_EQ(r.status, 1);
  EXPECT_NE(r.err.find("can't be stored in a JVW record"), std::string::npos) << r.err;
  JvwReader reader(jvw);
  const std::vector<FaceData> faces = reader.readFaces();
  ASSERT_FALSE(faces.empty()) << "the other image's faces are still written";
  for (const FaceData& f : faces) EXPECT_EQ(f.filePath(), photo);
}
