#include "tonebits/foundation/Aud__StreamBuffer.h"

namespace Aud {

StreamBuffer::StreamBuffer(unsigned int tagValue, unsigned int samples, int type) noexcept
    : tag(tagValue), numSamples(samples), sampleType(type) {}

}  // namespace Aud
