// The readable form of a photo meta: every section, in the units the meta
// keeps, from the test kit's hand-made meta.
#include "meta_json.h"

#include "testkit/meta_builder.h"

#include <gtest/gtest.h>

#include <cstring>

namespace {

using lumicor_tool::MetaToJson;

class MetaJsonTest : public testing::Test {
protected:
    void SetUp() override { ASSERT_TRUE(lumicor::test::BuildHandMadeMeta(&meta_)); }
    void TearDown() override { VondDisposeMeta(&meta_); }
    _VondMeta meta_;
};

TEST_F(MetaJsonTest, EverySectionInReadableForm) {
    const nlohmann::ordered_json j = MetaToJson(meta_);
    EXPECT_EQ(j["version"]["build"], "13121700");
    EXPECT_EQ(j["version"]["metaVersion"], 8);
    EXPECT_EQ(j["analysisConfig"]["faceDetectDicMode"], 7);
    EXPECT_EQ(j["analysisConfig"]["faceEngineParam"], 1.0);

    const auto& faces = j["faces"];
    EXPECT_EQ(faces["engineVersion"], "ORL_3100");
    EXPECT_EQ(faces["dateTime"], "2013:12:17 10:20:30");
    EXPECT_EQ(faces["clusterSubject"], "0x00020003");
    ASSERT_EQ(faces["regions"].size(), 2u);
    const auto& f = faces["regions"][0];
    EXPECT_EQ(f["box"], (nlohmann::ordered_json{{"x", 400}, {"y", 300}, {"width", 320}, {"height", 320}}));
    EXPECT_EQ(f["rotation"]["yaw"], 5.0);
    EXPECT_EQ(f["rotation"]["pitch"], -3.5);
    EXPECT_EQ(f["rotation"]["roll"], 12.25);
    EXPECT_EQ(f["rightEye"]["x"], 480);
    EXPECT_EQ(f["leftEye"]["y"], 402);
    EXPECT_TRUE(f["rightMouthEnd"].is_null());  // not located
    EXPECT_EQ(f["age"]["min"], 20);
    EXPECT_EQ(f["age"]["max"], 29);
    ASSERT_EQ(f["parts"].size(), 2u);
    EXPECT_EQ(f["parts"][0]["id"], "%");
    EXPECT_EQ(f["parts"][0]["x"], 560.5);
    EXPECT_EQ(f["parts"][1]["id"], "=");
    EXPECT_EQ(f["parts"][1]["y"], 580.75);
    ASSERT_EQ(f["attributes"].size(), 2u);
    EXPECT_EQ(f["attributes"][0]["name"], "smile");
    EXPECT_EQ(f["attributes"][0]["score"], 40);
    EXPECT_EQ(f["attributes"][1]["id"], 2);
    EXPECT_EQ(f["feature"]["type"], "PDEC_C2");
    EXPECT_EQ(f["feature"]["hex"].get<std::string>().size(), 510u);
    EXPECT_EQ(f["feature"]["hex"].get<std::string>().substr(0, 4), "030a");  // seed 3, step 7
    EXPECT_EQ(f["detectionScore"], 0.875);
    EXPECT_EQ(faces["regions"][1]["blurScore"], 0.25);

    const auto& s = j["similarity"];
    EXPECT_EQ(s["metaVersion"], "2.0");
    EXPECT_EQ(s["engineVersion"], "1.4.13121700");
    EXPECT_EQ(s["mainColor"], (nlohmann::ordered_json{{"L", 54}, {"a", 12}, {"b", -27}}));  // a, b centred on 0
    ASSERT_EQ(s["palette"].size(), 32u);
    EXPECT_EQ(s["palette"][1]["count"], 593);
    EXPECT_EQ(s["textureVertical"][7], 1091);
    ASSERT_EQ(s["edge"].size(), 81u);
    EXPECT_EQ(s["edge"][1], -2.875);

    const auto& q = j["quality"];
    EXPECT_EQ(q["fingerOnLens"], 0.75);
    EXPECT_EQ(q["cameraShake"], -1.0);
    ASSERT_EQ(q["fingers"].size(), 2u);
    ASSERT_EQ(q["fingers"][1]["outline"].size(), 4u);
    EXPECT_EQ(q["fingers"][1]["outline"][1], (nlohmann::ordered_json{13, 54}));
    EXPECT_EQ(q["blurMap"]["width"], 20);
    ASSERT_EQ(q["blurMap"]["rows"].size(), 15u);
    EXPECT_EQ(q["blurMap"]["rows"][1][0], 20 * 37 % 251);

    EXPECT_EQ(j["colorLabels"]["red"], 30);
    EXPECT_EQ(j["colorLabels"]["metaVersion"], "1.0");

    const auto& a = j["attention"];
    EXPECT_EQ(a["libVersion"], "CALib 2.1.0");
    EXPECT_EQ(a["isFace"], false);
    EXPECT_EQ(a["analyzedWidth"], 640);
    ASSERT_EQ(a["areas"].size(), 4u);
    EXPECT_EQ(a["areas"][1]["x"], 0.6875);
    EXPECT_EQ(a["areas"][0]["saliency"], 255);
    EXPECT_FALSE(a["areas"][0].contains("direction"));
}

TEST_F(MetaJsonTest, FaceAreasUnknownAgesAndDamagedTexts) {
    const int32_t directions[2] = {-1, 6};
    ASSERT_TRUE(lumicor::test::SetFaceAreas(&meta_, 2, directions));
    meta_.faceMeta.pRegions[1].ageMin = 255;
    std::memset(meta_.faceMeta.engineVersion, 0xE9, sizeof meta_.faceMeta.engineVersion);  // no NUL, not UTF-8

    const nlohmann::ordered_json j = MetaToJson(meta_);
    EXPECT_EQ(j["attention"]["isFace"], true);
    EXPECT_EQ(j["attention"]["areas"][0]["direction"], -1);
    EXPECT_FALSE(j["attention"]["areas"][0].contains("saliency"));
    EXPECT_TRUE(j["faces"]["regions"][1]["age"]["min"].is_null());
    EXPECT_EQ(j["faces"]["engineVersion"].get<std::string>().size(), 16u);  // stops at the field's end
    // Written out without an exception, the bad bytes replaced.
    const std::string text = j.dump(2, ' ', false, nlohmann::ordered_json::error_handler_t::replace);
    EXPECT_NE(text.find("\"engineVersion\""), std::string::npos);

    const lumicor_tool::FaceView view = lumicor_tool::ViewFace(meta_.faceMeta.pRegions[1]);
    EXPECT_EQ(view.smile, 91);
    EXPECT_EQ(view.box.width, 200);
    EXPECT_EQ(view.ageMin, 255);
}

}  // namespace
