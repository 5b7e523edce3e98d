#include "tracking/TrackerFactory.h"

#include "tracking/KFTracker.h"

TrackerFactory::TrackerFactory() { init(); }

TrackerFactory& TrackerFactory::instance()
{
    static TrackerFactory factory;
    return factory;
}

void TrackerFactory::init()
{
    // The particle-filter trackers are not built in; their names stay
    // unregistered so that asking for them yields null.
    creators["SIMPLE_TRACKER"] = &Tracker::create;
    creators["KF_TRACKER"] = &KFTracker::create;
}
