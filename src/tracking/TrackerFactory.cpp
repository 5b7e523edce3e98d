#include "tracking/TrackerFactory.h"

#include "tracking/CPFTracker.h"
#include "tracking/KFTracker.h"
#include "tracking/PFTracker.h"

TrackerFactory::TrackerFactory() { init(); }

TrackerFactory& TrackerFactory::instance()
{
    static TrackerFactory factory;
    return factory;
}

void TrackerFactory::init()
{
    creators["SIMPLE_TRACKER"] = &Tracker::create;
    creators["KF_TRACKER"] = &KFTracker::create;
    creators["PF_TRACKER"] = &PFTracker::create;
    creators["CPF_TRACKER"] = &CPFTracker::create;
}
