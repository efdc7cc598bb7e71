// The one loop behind every character conversion of the support library: map each input
// character into a caller's buffer, never past its size, and always terminate it.
#pragma once

#include <cstddef>

namespace vqm {

template <typename In, typename Out, typename Map>
int MapIntoBuffer(const In* in, int count, Out* out, size_t outSize, Map map) {
    if (!out || outSize == 0) return 0;
    int written = 0;
    if (in) {
        for (int i = 0; i < count && static_cast<size_t>(written) + 1 < outSize; ++i)
            out[written++] = map(in[i]);
    }
    out[written] = Out{};
    return written;
}

}  // namespace vqm
