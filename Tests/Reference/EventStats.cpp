#include "Tests/Reference/EventStats.h"

namespace VexaTouch::Reference {

void EventStats::update(const HandStats& h) {
    const std::int32_t r = h._activeRegion;

    if (h._isTouching && !h._wasTouching) {
        return;
    }

    if (h._isHoldSuppressed) {
        if (h._wasHolding) {
            _stats.numHolding2Suppressed += 1;
        }
        if (h._wouldBeIsHolding && !h._wouldBeWasHolding) {
            _stats.numRejectedBeginHold += 1;
            if (r == 3) {
                _stats.numRejectedVolumeIncrement += 1;
            } else if (r == 2) {
                _stats.numRejectedVolumeDecrement += 1;
            } else if (r == 1) {
                _stats.numRejectedQuarnCall += 1;
            }
        } else if (h._wouldBeIsHolding && h._wouldBeWasHolding) {
            _stats.numRejectedIncrementHold += 1;
            if (r == 3) {
                _stats.numRejectedVolumeIncrement += 1;
            } else if (r == 2) {
                _stats.numRejectedVolumeDecrement += 1;
            } else if (r == 1) {
                _stats.numRejectedQuarnCallIncrement += 1;
            }
        } else {
            if (r == 2) {
                _stats.numRejectedVolumeDecrement += 1;
            } else if (r == 3) {
                _stats.numRejectedVolumeIncrement += 1;
            }
        }
    } else if (h._isHolding && !h._wasHolding) {
        if (h._wasHoldSuppressed) {
            _stats.numSuppressed2Holding += 1;
        }
        _stats.numBeginHold += 1;
        if (r == 1) {
            _stats.numQuarnCall += 1;
        } else if (r == 2) {
            _stats.numVolumeDecrement += 1;
        } else if (r == 3) {
            _stats.numVolumeIncrement += 1;
        }
    } else if (h._isHolding && h._wasHolding) {
        _stats.numIncrementHold += 1;
        if (r == 1) {
            _stats.numQuarnCallIncrement += 1;
        } else if (r == 2) {
            _stats.numVolumeDecrement += 1;
        } else if (r == 3) {
            _stats.numVolumeIncrement += 1;
        }
    } else if (h._wasHolding) {
        _stats.numEndHold += 1;
    } else if (!h._wouldBeIsHolding && h._wouldBeWasHolding) {
        _stats.numRejectedEndHold += 1;
    } else if (h._maybeTap && !h._isTap) {
        _stats.numRejectedTap += 1;
        if (r == 1) {
            _stats.numRejectedPlayPause += 1;
        } else if (r == 2) {
            _stats.numRejectedVolumeDown += 1;
        } else if (r == 3) {
            _stats.numRejectedVolumeUp += 1;
        }
    } else if (h._isTap) {
        _stats.numTaps += 1;
        if (r == 1) {
            _stats.numPlayPause += 1;
        } else if (r == 2) {
            _stats.numVolumeDown += 1;
        } else if (r == 3) {
            _stats.numVolumeUp += 1;
        }
    }
}

Vexa::PropertyValue EventStats::statsDictionary() const {
    using Dictionary = Vexa::PropertyValue::Dictionary;
    Dictionary dispatched;
    dispatched["numTaps"] = _stats.numTaps;
    dispatched["numBeginHold"] = _stats.numBeginHold;
    dispatched["numIncrementHold"] = _stats.numIncrementHold;
    dispatched["numEndHold"] = _stats.numEndHold;
    dispatched["numHolding2Suppressed"] = _stats.numHolding2Suppressed;
    dispatched["numVolumeUp"] = _stats.numVolumeUp;
    dispatched["numVolumeIncrement"] = _stats.numVolumeIncrement;
    dispatched["numVolumeDown"] = _stats.numVolumeDown;
    dispatched["numVolumeDecrement"] = _stats.numVolumeDecrement;
    dispatched["numPlayPause"] = _stats.numPlayPause;
    dispatched["numQuarnCall"] = _stats.numQuarnCall;
    dispatched["numQuarnCallIncrement"] = _stats.numQuarnCallIncrement;
    Dictionary rejected;
    rejected["numRejectedTap"] = _stats.numRejectedTap;
    rejected["numRejectedBeginHold"] = _stats.numRejectedBeginHold;
    rejected["numRejectedIncrementHold"] = _stats.numRejectedIncrementHold;
    rejected["numRejectedEndHold"] = _stats.numRejectedEndHold;
    rejected["numSuppressed2Holding"] = _stats.numSuppressed2Holding;
    rejected["numRejectedVolumeUp"] = _stats.numRejectedVolumeUp;
    rejected["numRejectedVolumeIncrement"] = _stats.numRejectedVolumeIncrement;
    rejected["numRejectedVolumeDown"] = _stats.numRejectedVolumeDown;
    rejected["numRejectedVolumeDecrement"] = _stats.numRejectedVolumeDecrement;
    rejected["numRejectedPlayPause"] = _stats.numRejectedPlayPause;
    rejected["numRejectedQuarnCall"] = _stats.numRejectedQuarnCall;
    rejected["numRejectedQuarnCallIncrement"] = _stats.numRejectedQuarnCallIncrement;
    return Dictionary{{"Dispatched", dispatched}, {"Rejected", rejected}};
}

}  // namespace VexaTouch::Reference
