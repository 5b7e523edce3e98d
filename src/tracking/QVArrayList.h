#ifndef QUORIN_TRACKING_QVARRAYLIST_H
#define QUORIN_TRACKING_QVARRAYLIST_H

#include <cstddef>
#include <cstdint>
#include <vector>

// Slot array with stable indices: a track keeps its index for its whole life,
// so score matrices can be indexed by slot. Dead slots keep their contents and
// are reused last-freed-first. Removing is the user's job: clear alive[i] and
// push i on freeSlots.
template <typename T>
class QVArrayList {
public:
    std::vector<T> items;
    std::vector<bool> alive;
    std::vector<uint32_t> freeSlots;

    // Returns the slot index that now holds value.
    uint32_t insert(const T& value)
    {
        if (freeSlots.empty()) {
            items.push_back(value);
            alive.push_back(true);
            return static_cast<uint32_t>(items.size() - 1);
        }
        const uint32_t slot = freeSlots.back();
        freeSlots.pop_back();
        // A free-slot entry always comes from an index of items; keep the
        // array consistent even if a user pushed something bogus.
        if (slot >= items.size()) {
            items.resize(slot + 1);
            alive.resize(slot + 1, false);
        }
        items[slot] = value;
        alive[slot] = true;
        return slot;
    }

    size_t size() const { return items.size(); }
    bool isAlive(size_t slot) const { return slot < alive.size() && alive[slot]; }

    // Marks a slot dead and makes it reusable. Does not look at the alive flag:
    // removing a dead slot again stacks its index once more.
    void remove(uint32_t slot)
    {
        if (slot >= alive.size())
            return;
        alive[slot] = false;
        freeSlots.push_back(slot);
    }

    // Trackers that stack dead slots again every frame would grow freeSlots
    // for as long as a slot stays dead. Past `limit` entries the oldest half
    // goes: a frame pops at most one entry per new face, so only a frame with
    // more than limit / 2 new faces could tell the difference.
    void boundFreeSlots(size_t limit = 1024)
    {
        if (freeSlots.size() <= limit)
            return;
        const size_t keep = limit / 2;
        freeSlots.erase(freeSlots.begin(), freeSlots.end() - std::ptrdiff_t(keep));
    }
};

#endif
