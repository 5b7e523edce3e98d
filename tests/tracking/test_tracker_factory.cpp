#include <gtest/gtest.h>

#include <memory>

#include "tracking/KFTracker.h"
#include "tracking/TrackerFactory.h"

TEST(TrackerFactoryLookup, MakesTheRegisteredTrackers)
{
    std::unique_ptr<Tracker> simple(
        TrackerFactory::instance().createInstance("{  \"name\" : \"SIMPLE_TRACKER\",   \"param\" : {  }}"));
    ASSERT_NE(simple, nullptr);
    EXPECT_EQ(simple->name(), "SIMPLE_TRACKER");

    std::unique_ptr<Tracker> kf(
        TrackerFactory::instance().createInstance("{  \"name\" : \"KF_TRACKER\",   \"param\" : {  }}"));
    ASSERT_NE(kf, nullptr);
    EXPECT_EQ(kf->name(), "KF_TRACKER");
    EXPECT_NE(dynamic_cast<KFTracker*>(kf.get()), nullptr);
}

TEST(TrackerFactoryLookup, UnregisteredNamesGiveNull)
{
    TrackerFactory& f = TrackerFactory::instance();
    EXPECT_EQ(f.createInstance("{\"name\": \"PF_TRACKER\", \"param\": {}}"), nullptr);
    EXPECT_EQ(f.createInstance("{\"name\": \"CPF_TRACKER\", \"param\": {}}"), nullptr);
    EXPECT_EQ(f.createInstance("{\"name\": \"kf_tracker\"}"), nullptr) << "names are case-sensitive";
    EXPECT_EQ(f.createInstance("{\"param\": {}}"), nullptr) << "no name";
    EXPECT_EQ(f.createInstance("{}"), nullptr);
}

TEST(TrackerFactoryLookup, MissingParamIsAccepted)
{
    std::unique_ptr<Tracker> t(TrackerFactory::instance().createInstance("{\"name\": \"KF_TRACKER\"}"));
    EXPECT_NE(t, nullptr);
}

TEST(TrackerFactoryLookup, IsOneObject)
{
    EXPECT_EQ(&TrackerFactory::instance(), &TrackerFactory::instance());
}
