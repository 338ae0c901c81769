#include "requests/request_context.h"

#include <climits>
#include <cmath>

namespace varnel::detail {

RequestContext::RequestContext(std::shared_ptr<Transport> transport) : session(std::move(transport)) {
    session.onProgress = [this](std::int16_t& percent) { RaiseProgress(percent); };
}

void RequestContext::PercentLimit(std::int16_t x) {
    if (x == 0) return;
    lowerLimit_ = lowerLimit_ == -1 ? 0 : upperLimit_;
    upperLimit_ = x;
}

void RequestContext::resetPercentage() {
    lowerLimit_ = -1;
    upperLimit_ = 100;
}

void RequestContext::RaiseProgress(std::int16_t percent) {
    // Progress is a courtesy: nothing here, not even the client's handler, may fail a request.
    try {
        if (percent <= 0) return;
        const int product = (upperLimit_ - lowerLimit_) * percent;
        if (product < SHRT_MIN || product > SHRT_MAX) return;
        const double value = lowerLimit_ + std::nearbyint(product / 100.0);
        if (value < SHRT_MIN || value > SHRT_MAX) return;
        std::int16_t done = static_cast<std::int16_t>(value);
        if (onProgress) onProgress(done);
    } catch (...) {}
}

void RequestContext::raiseComplete() {
    if (onComplete) onComplete();
}

}  // namespace varnel::detail
