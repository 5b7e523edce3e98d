#include <gtest/gtest.h>

#include <memory>

#include "tracking/TrackerFactory.h"

TEST(TrackerFactoryLookup, MakesTheRegisteredTrackers)
{
    const char* names[] = {"SIMPLE_TRACKER", "KF_TRACKER", "PF_TRACKER", "CPF_TRACKER"};
    for (const char* name : names) {
        std::unique_ptr<Tracker> t(TrackerFactory::instance().createInstance(
            std::string("{  \"name\" : \"") + name + "\",   \"param\" : {  }}"));
        ASSERT_NE(t, nullptr) << name;
        EXPECT_EQ(t->name(), name);
    }
}

TEST(TrackerFactoryLookup, UnregisteredNamesGiveNull)
{
    TrackerFactory& f = TrackerFactory::instance();
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
