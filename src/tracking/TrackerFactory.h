#ifndef QUORIN_TRACKING_TRACKERFACTORY_H
#define QUORIN_TRACKING_TRACKERFACTORY_H

#include "quorin/ObjectFactory.h"
#include "tracking/Tracker.h"

// Makes trackers by name from {"name": ..., "param": ...}. Names that are not
// registered give null, which the detector treats as tracking off.
class TrackerFactory : public ObjectFactory<Tracker> {
public:
    static TrackerFactory& instance();
    void init();

private:
    TrackerFactory();
};

#endif
