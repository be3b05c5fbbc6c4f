#include "Algorithm/SVM.h"

#include "Algorithm/SortNetwork.h"

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <limits>

namespace VexaTouch {

constexpr SVM::Parameters SVM::_mu = {
    559.2485F, 458.1396F, 409.6764F, 376.5288F, 339.7854F, 302.5308F, 281.1469F, 258.9062F,
    234.2004F, 215.7817F, 199.7768F, 184.8617F, 172.0251F, 160.0365F, 148.0888F, 135.208F,
    124.4527F, 114.4343F, 104.0568F, 93.4508F,  83.6343F,  74.3161F,  65.3713F,  57.6177F,
    50.8842F,  43.4918F,  37.2454F,  31.5491F,  26.5578F,  22.2556F,  18.6728F,  15.4697F,
    12.7815F,  10.1925F,  7.6475F,   5.3422F,   3.7211F,   2.1581F,
};

constexpr SVM::Parameters SVM::_std_ = {
    319.631F,  264.2479F, 238.355F,  222.3886F, 211.1872F, 206.0873F, 198.0056F, 189.2092F,
    182.5528F, 177.034F,  170.0103F, 163.5788F, 157.3571F, 151.1289F, 144.6578F, 138.2757F,
    131.4855F, 124.7151F, 116.673F,  107.0524F, 98.8414F,  91.5114F,  84.5376F,  78.8144F,
    72.6408F,  64.3881F,  58.6809F,  51.8691F,  45.1187F,  39.4927F,  35.9957F,  32.8257F,
    29.4461F,  25.6704F,  20.1275F,  15.8161F,  11.7617F,  10.0508F,
};

constexpr SVM::Parameters SVM::_w = {
    2.0791F,  0.577F,   -0.0003F, 1.7971F,  0.8896F,  -0.194F,  -1.7877F, 1.9933F,
    0.5968F,  -0.6801F, -0.1372F, -0.4558F, 0.3444F,  0.1195F,  0.2427F,  0.2738F,
    -0.7458F, -0.2226F, -0.95F,   -0.238F,  0.0785F,  -1.6108F, -0.4774F, 0.3914F,
    -0.0379F, -0.5014F, 0.2391F,  0.5287F,  -0.3405F, 0.2821F,  0.8225F,  -0.5142F,
    -1.1009F, 0.3262F,  -1.7422F, 0.4487F,  0.0877F,  -0.2101F,
};

void SVM::updateSVMScore(const std::vector<Pixel>& pixels,
                         const std::vector<VirtualPixel>& virtualPixels, float activationThreshold,
                         unsigned int /*timeMs*/) {
    updateSVMScore(ChannelSummary::of(pixels, virtualPixels), activationThreshold);
}

void SVM::updateSVMScore(const ChannelSummary& channels, float activationThreshold) noexcept {
    _score = 0.0F;
    // The second strongest is above noise exactly when two channels are.
    if (!(static_cast<float>(channels.largestValue) > activationThreshold ||
          channels.aboveNoise >= 2)) {
        return;
    }
    // Places that no channel takes sort behind all channels.
    SortNetwork::Run<12> sorted;
    sorted.fill(allLanes(-std::numeric_limits<float>::infinity()));
    std::array<float, kChannelCount> values;
    std::ranges::transform(channels.values, values.begin(),
                           [](std::int32_t value) { return static_cast<float>(value); });
    std::memcpy(sorted.data(), values.data(), sizeof values);
    SortNetwork::sortDescending(sorted);
    std::memcpy(values.data(), sorted.data(), sizeof values);

    Parameters terms;
    for (std::size_t k = 0; k < kChannelCount; ++k) {
        terms[k] = (values[k] - _mu[k]) / _std_[k] * _w[k];
    }
    float sum = 0.0F;
    for (const float term : terms) {
        sum += term;
    }
    _score = _b + sum;
}

}  // namespace VexaTouch
