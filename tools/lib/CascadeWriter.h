#ifndef QUORIN_TOOLS_CASCADEWRITER_H
#define QUORIN_TOOLS_CASCADEWRITER_H

// Writes the detector's cascade model format (the plain payload; pack it with
// packRawModel from ModelPacking.h or tools/pack_models.py to serve it).
// Layout, all values 4-byte little-endian:
//   header: int32 24, 24, 7 (window width, height, number of bin thresholds)
//   int32 commonStageCount, then that many stage records
//   per branch (as many as the scoreCount of the last common stage):
//     int32 branchStageCount, then that many stage records
// Stage record:
//   int32 feature kind (1 Haar, 2 inverse deviation; other kinds end here)
//   kind 1 only: int32 rectangle count, then per rectangle
//                float32 weight, int32 left, top, right, bottom (window coords, 0..24)
//   float32 binThresholds[7], descending (bin 0 holds the highest values)
//   int32 scoreCount (0..15), int32 remapFlag
//   remapFlag != 0: int32 remap[scoreCount], each 0..scoreCount-1
//   per score: float32 binScores[8], float32 rejectThreshold
// The number of branches is not stored: the reader takes it from the scoreCount
// of the last common stage, so even a one-score cascade carries one (empty)
// branch; completeBranches pads a model that doesn't say so.
// The writer checks nothing: tests use it to make malformed models too.

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

struct CascadeModelRect {
    float weight = 1.0f;
    int32_t left = 0;
    int32_t top = 0;
    int32_t right = 0;
    int32_t bottom = 0;
};

struct CascadeModelFeature {
    int32_t kind = 1;
    std::vector<CascadeModelRect> rects;
};

struct CascadeModelStage {
    CascadeModelFeature feature;
    std::array<float, 7> binThresholds{};
    int32_t scoreCount = 1;
    int32_t remapFlag = 0;
    std::vector<int32_t> remap;                  // scoreCount entries when remapFlag != 0
    std::vector<std::array<float, 8>> binScores; // scoreCount entries
    std::vector<float> rejectThresholds;         // scoreCount entries
};

struct CascadeModel {
    std::array<int32_t, 3> header{{24, 24, 7}};
    std::vector<CascadeModelStage> common;
    std::vector<std::vector<CascadeModelStage>> branches;
};

class CascadeWriter {
public:
    // A Haar feature from rectangles (weight, left, top, right, bottom).
    static CascadeModelFeature haar(std::vector<CascadeModelRect> rects)
    {
        CascadeModelFeature f;
        f.kind = 1;
        f.rects = std::move(rects);
        return f;
    }

    // The window's inverse deviation as a feature.
    static CascadeModelFeature deviation()
    {
        CascadeModelFeature f;
        f.kind = 2;
        return f;
    }

    // One-score stump: adds `above` when the value is at least `threshold`,
    // else `below`; rejects when the running score falls below `reject`.
    static CascadeModelStage stump(CascadeModelFeature feature, float threshold, float above, float below,
                                   float reject)
    {
        CascadeModelStage s;
        s.feature = std::move(feature);
        s.binThresholds.fill(threshold);
        s.scoreCount = 1;
        s.binScores.push_back({{above, above, above, above, below, below, below, below}});
        s.rejectThresholds.push_back(reject);
        return s;
    }

    // A stage without a feature that adds one constant per score and rejects nothing.
    static CascadeModelStage constants(std::vector<float> const& add)
    {
        CascadeModelStage s;
        s.feature.kind = 0;
        s.binThresholds.fill(0.0f);
        s.scoreCount = static_cast<int32_t>(add.size());
        for (float a : add) {
            s.binScores.push_back({{a, a, a, a, a, a, a, a}});
            s.rejectThresholds.push_back(-1e30f);
        }
        return s;
    }
    // Pads `branches` with empty ones up to the scoreCount of the last common stage.
    static void completeBranches(CascadeModel& model)
    {
        const size_t wanted = model.common.empty() ? 0 : static_cast<size_t>(std::max(model.common.back().scoreCount, 0));
        if (model.branches.size() < wanted)
            model.branches.resize(wanted);
    }

    // Serialises the model to its plain payload.
    static std::vector<uint8_t> toBytes(CascadeModel const& model)
    {
        std::vector<uint8_t> out;
        for (int32_t v : model.header)
            putInt(out, v);
        putInt(out, static_cast<int32_t>(model.common.size()));
        for (CascadeModelStage const& s : model.common)
            putStage(out, s);
        for (std::vector<CascadeModelStage> const& branch : model.branches) {
            putInt(out, static_cast<int32_t>(branch.size()));
            for (CascadeModelStage const& s : branch)
                putStage(out, s);
        }
        return out;
    }

    // Writes the plain payload to a file; false when it can't be written.
    static bool writeFile(std::string const& path, CascadeModel const& model)
    {
        const std::vector<uint8_t> bytes = toBytes(model);
        std::FILE* f = std::fopen(path.c_str(), "wb");
        if (f == nullptr)
            return false;
        const bool ok = std::fwrite(bytes.data(), 1, bytes.size(), f) == bytes.size();
        return std::fclose(f) == 0 && ok;
    }

    static void putInt(std::vector<uint8_t>& out, int32_t v)
    {
        const uint32_t u = static_cast<uint32_t>(v);
        for (int i = 0; i < 4; ++i)
            out.push_back(static_cast<uint8_t>(u >> (8 * i)));
    }

    static void putFloat(std::vector<uint8_t>& out, float v)
    {
        uint32_t u = 0;
        std::memcpy(&u, &v, sizeof u);
        putInt(out, static_cast<int32_t>(u));
    }

    static void putStage(std::vector<uint8_t>& out, CascadeModelStage const& s)
    {
        putInt(out, s.feature.kind);
        if (s.feature.kind == 1) {
            putInt(out, static_cast<int32_t>(s.feature.rects.size()));
            for (CascadeModelRect const& r : s.feature.rects) {
                putFloat(out, r.weight);
                putInt(out, r.left);
                putInt(out, r.top);
                putInt(out, r.right);
                putInt(out, r.bottom);
            }
        }
        for (float t : s.binThresholds)
            putFloat(out, t);
        putInt(out, s.scoreCount);
        putInt(out, s.remapFlag);
        if (s.remapFlag != 0)
            for (int i = 0; i < s.scoreCount; ++i)
                putInt(out, i < static_cast<int>(s.remap.size()) ? s.remap[i] : 0);
        for (int i = 0; i < s.scoreCount; ++i) {
            const std::array<float, 8> bins =
                i < static_cast<int>(s.binScores.size()) ? s.binScores[i] : std::array<float, 8>{};
            for (float b : bins)
                putFloat(out, b);
            putFloat(out, i < static_cast<int>(s.rejectThresholds.size()) ? s.rejectThresholds[i] : 0.0f);
        }
    }
};

#endif
