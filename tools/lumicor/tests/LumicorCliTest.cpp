// The lumicor command line run in-process: each command on real files, and
// bad files and options ending in one line on standard error and a non-zero
// exit status.
#include "cli.h"
#include "inputs.h"
#include "progress.h"
#include "tool_test_files.h"

#include "testkit/meta_builder.h"
#include "testkit/temp_dir.h"

#include <lumicor/vond.h>

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <cstdio>
#include <string>
#include <vector>

namespace {

using lumicor::test::TempDir;

struct Outcome {
    int exit;
    std::string out, err;
};

Outcome RunTool(std::vector<std::string> args) {
    args.insert(args.begin(), "lumicor");
    std::vector<char*> argv;
    for (std::string& a : args) argv.push_back(&a[0]);
    testing::internal::CaptureStdout();
    testing::internal::CaptureStderr();
    const int exit = lumicor_tool::RunCommandLine(static_cast<int>(argv.size()), argv.data());
    std::fflush(stdout);
    std::fflush(stderr);
    Outcome o{exit, testing::internal::GetCapturedStdout(), testing::internal::GetCapturedStderr()};
    return o;
}

// Exactly one line, "lumicor: ...".
bool OneErrorLine(const std::string& err) {
    return err.rfind("lumicor: ", 0) == 0 && err.find('\n') == err.size() - 1;
}

// The hand-made meta with another palette and edge feature.
bool BuildDifferentMeta(_VondMeta* meta) {
    if (!lumicor::test::BuildHandMadeMeta(meta)) return false;
    for (auto& c : meta->similarity.colHist32) c.lab.l = static_cast<uint8_t>(99 - c.lab.l);
    for (float& v : meta->similarity.edge.value) v = 5.0f - v;
    return true;
}

class LumicorCliTest : public testing::Test {
protected:
    void SetUp() override {
        handMade_ = lumicor::test::BuildBlob(lumicor::test::BuildHandMadeMeta);
        other_ = lumicor::test::BuildBlob(BuildDifferentMeta);
        ASSERT_FALSE(handMade_.empty());
        ASSERT_FALSE(other_.empty());
        lumicor_tool_test::WriteBytes(dir_.File("hand.lmeta"), handMade_);
        lumicor_tool_test::WriteBytes(dir_.File("copy.lmeta"), handMade_);
        lumicor_tool_test::WriteBytes(dir_.File("other.lmeta"), other_);
        lumicor_tool_test::WriteBytes(dir_.File("photo.png"),
                                      lumicor_tool_test::EncodePng(lumicor_tool_test::Quadrants(320, 240)));
        dir_.Write("notes.txt", "not a photo");
        dir_.Write("short.lmeta", "VOND");
    }
    std::string F(const char* name) const { return dir_.File(name); }

    TempDir dir_;
    std::vector<uint8_t> handMade_, other_;
};

TEST_F(LumicorCliTest, BadOptionsAndFilesEndInOneLine) {
    struct Case {
        std::vector<std::string> args;
        int exit;
        const char* says;
    } const cases[] = {
        {{}, 2, "subcommand"},
        {{"bogus"}, 2, "unknown command 'bogus'"},
        {{"analyze"}, 2, "photos"},
        {{"analyze", "--faces", "maybe", F("photo.png")}, 2, "maybe"},
        {{"analyze", "-j", "0", F("photo.png")}, 2, "--jobs"},
        {{"frame", F("hand.lmeta")}, 2, "--aspect"},
        {{"frame", F("hand.lmeta"), "--aspect", "16x9"}, 2, "expected W:H"},
        {{"frame", F("hand.lmeta"), "--aspect", "0:1"}, 2, "expected W:H"},
        {{"frame", F("hand.lmeta"), "--aspect", "1:1", "-o", F("crop.png")}, 2, "-o needs the photo"},
        {{"frame", F("hand.lmeta"), "--aspect", "1:1", "--photo", F("photo.png")}, 1, "the meta was made from"},
        {{"frame", F("hand.lmeta"), "--aspect", "20:1"}, 1, "no framing found"},
        {{"frame", F("short.lmeta"), "--aspect", "1:1"}, 1, "not a valid photo meta"},
        {{"frame", F("notes.txt"), "--aspect", "1:1"}, 1, "unsupported format"},
        {{"similar", F("hand.lmeta")}, 2, "at least two"},
        {{"similar", F("hand.lmeta"), F("missing.lmeta")}, 1, "no such file"},
        {{"dump", F("missing.lmeta")}, 1, "cannot open"},
        {{"dump", F("photo.png")}, 1, "a photo, not a photo meta"},
        {{"dump", F("notes.txt")}, 1, "not a valid photo meta"},
        {{"dump", dir_.path()}, 1, "is a folder"},
        {{"analyze", F("notes.txt"), "-o", F("out")}, 1, "unsupported format"},
        {{"analyze", F("hand.lmeta"), "-o", F("out")}, 1, "a photo meta, not a photo"},
    };
    for (const Case& c : cases) {
        std::string line;
        for (const std::string& a : c.args) line += a + " ";
        SCOPED_TRACE(line);
        const Outcome o = RunTool(c.args);
        EXPECT_EQ(o.exit, c.exit);
        EXPECT_TRUE(OneErrorLine(o.err)) << o.err;
        EXPECT_NE(o.err.find(c.says), std::string::npos) << o.err;
    }
}

TEST_F(LumicorCliTest, DumpFrameAndSimilarOnMetas) {
    Outcome o = RunTool({"dump", F("hand.lmeta")});
    EXPECT_EQ(o.exit, 0) << o.err;
    EXPECT_NE(o.out.find("*** VondOrielDump() ***"), std::string::npos);
    EXPECT_NE(o.out.find("*** VondCALibDump() ***"), std::string::npos);
    EXPECT_NE(o.out.find("saliency = 180"), std::string::npos);

    o = RunTool({"frame", F("hand.lmeta"), "--aspect", "16:9"});
    ASSERT_EQ(o.exit, 0) << o.err;
    EXPECT_EQ(o.err, "");
    EXPECT_NE(o.out.find("crop 16:9 (mode 4, zoom limit 10)"), std::string::npos) << o.out;
    float x, y, w, h;
    int px, py, pw, ph, W, H;
    const size_t at = o.out.find("fractions:");
    ASSERT_NE(at, std::string::npos);
    ASSERT_EQ(std::sscanf(o.out.c_str() + at, "fractions: x=%f y=%f width=%f height=%f\n  pixels: x=%d y=%d width=%d "
                                              "height=%d of %dx%d",
                          &x, &y, &w, &h, &px, &py, &pw, &ph, &W, &H),
              10)
        << o.out;
    EXPECT_EQ(W, 1600);  // the photo size the meta recorded
    EXPECT_EQ(H, 1200);
    EXPECT_NEAR(pw * 9.0 / 16.0, ph, 3.0);
    EXPECT_NEAR(px, x * 1600, 1.0);

    // The reference's copy ranks first, at distance 0, as a near-duplicate.
    o = RunTool({"similar", F("hand.lmeta"), F("other.lmeta"), F("copy.lmeta")});
    EXPECT_EQ(o.exit, 0) << o.err;
    const size_t first = o.out.find("   1    0.0000  " + F("copy.lmeta") + "  (near-duplicate)\n");
    EXPECT_NE(first, std::string::npos) << o.out;
    EXPECT_NE(o.out.find("   2  "), std::string::npos) << o.out;
    EXPECT_NE(o.out.find("   2  "), std::string::npos) << o.out;
    EXPECT_EQ(o.out.find("other.lmeta  (near-duplicate)"), std::string::npos) << o.out;
}

TEST_F(LumicorCliTest, FoldersExpandToTheirPhotosInNameOrder) {
    TempDir folder;
    for (const char* name : {"b.JPG", "a.png", "c.txt", "d.lmeta", "e.jpeg"}) folder.Write(name, "x");
    std::vector<std::string> errors;
    const std::vector<std::string> photos = lumicor_tool::ExpandInputs({folder.path()}, false, &errors);
    EXPECT_EQ(photos, (std::vector<std::string>{folder.File("a.png"), folder.File("b.JPG"), folder.File("e.jpeg")}));
    EXPECT_TRUE(errors.empty());
    const std::vector<std::string> all =
        lumicor_tool::ExpandInputs({folder.File("c.txt"), folder.path()}, true, &errors);
    EXPECT_EQ(all.size(), 5u);  // a file named on the command line is taken whatever its name
    TempDir empty;
    lumicor_tool::ExpandInputs({empty.path(), folder.File("missing.jpg")}, false, &errors);
    ASSERT_EQ(errors.size(), 2u);
    EXPECT_NE(errors[0].find("no photos in this folder"), std::string::npos);
    EXPECT_NE(errors[1].find("no such file"), std::string::npos);

    EXPECT_EQ(lumicor_tool::Progress::Bar(5, 10, 2.0),
              "[###############...............] 5/10 photos, 2.5 photos/s");
}

TEST_F(LumicorCliTest, AnalyzeWritesMetaJsonAndAnnotatedPicture) {
    TempDir photos;
    // A JPEG stored sideways (EXIF orientation 6) and a PNG.
    lumicor_tool_test::WriteBytes(photos.File("turned.jpg"),
                                  lumicor_tool_test::EncodeJpeg(lumicor_tool_test::Quadrants(400, 300), 6));
    lumicor_tool_test::WriteBytes(photos.File("flat.png"),
                                  lumicor_tool_test::EncodePng(lumicor_tool_test::Quadrants(320, 240)));
    const std::string out = dir_.File("out");
    Outcome o = RunTool({"analyze", photos.path(), "-o", out, "--annotate", "-j", "2", "--faces", "none"});
    ASSERT_EQ(o.exit, 0) << o.err;
    EXPECT_EQ(o.err, "");  // no progress bar when not on a terminal
    EXPECT_NE(o.out.find("turned.jpg: 300x400, 0 faces"), std::string::npos) << o.out;
    EXPECT_NE(o.out.find("2 of 2 photos analysed"), std::string::npos) << o.out;

    for (const char* name : {"turned", "flat"}) {
        SCOPED_TRACE(name);
        const std::string base = out + "/" + name;
        const std::string blob = lumicor::test::ReadFileBytes(base + ".lmeta");
        _VondMeta meta;
        ASSERT_EQ(VondParseMeta(static_cast<uint32_t>(blob.size()), reinterpret_cast<const uint8_t*>(blob.data()), &meta)
                      .status,
                  VOND_STATUS_OK);
        const nlohmann::json j = nlohmann::json::parse(lumicor::test::ReadFileBytes(base + ".json"));
        EXPECT_EQ(j["blobBytes"], blob.size());
        EXPECT_EQ(j["faces"]["imageWidth"], meta.faceMeta.imageWidth);
        EXPECT_EQ(j["faces"]["regions"].size(), 0u);
        EXPECT_EQ(j["similarity"]["palette"].size(), meta.similarity.ncol32);
        EXPECT_EQ(j["attention"]["analyzedWidth"], meta.analyzedWidth);
        VondDisposeMeta(&meta);
        EXPECT_TRUE(lumicor::test::FileExists(base + ".annotated.png"));
    }
    const nlohmann::json turned = nlohmann::json::parse(lumicor::test::ReadFileBytes(out + "/turned.json"));
    EXPECT_EQ(turned["exifOrientation"], 6);
    EXPECT_EQ(turned["photoWidth"], 300);
    EXPECT_EQ(turned["faces"]["imageWidth"], 300);

    // A photo is analysed first and can be cropped.
    o = RunTool({"frame", photos.File("flat.png"), "--aspect", "1:1", "--faces", "none", "-o", dir_.File("crop.png")});
    ASSERT_EQ(o.exit, 0) << o.err;
    EXPECT_NE(o.out.find("of 320x240"), std::string::npos) << o.out;
    EXPECT_TRUE(lumicor::test::FileExists(dir_.File("crop.png")));

    // The same photo twice ranks as a near-duplicate of itself.
    o = RunTool({"similar", photos.File("flat.png"), out + "/flat.lmeta", photos.File("turned.jpg")});
    EXPECT_EQ(o.exit, 0) << o.err;
    EXPECT_NE(o.out.find("   1    0.0000  " + out + "/flat.lmeta  (near-duplicate)"), std::string::npos) << o.out;
}

}  // namespace
