#pragma once

#include <deque>
#include <string>
#include <variant>

#include "source/SourceInterface.h"

namespace receiver {

/// Units, sentences for the operator, and what the source is from there on, in the order in which they came
/// to be.
using Batch = std::deque<std::variant<SourceUnit, std::string, SourceDescription>>;

/// Makes units as fast as it can, on a thread of its own.
class ProducerInterface {
 public:
    virtual ~ProducerInterface() = default;
    virtual const SourceDescription& Description() const = 0;
    /// Appends what comes next, if anything. False when nothing follows. Waits where the source makes it
    /// wait, but not beyond a stop. Throws `ReceiverError` when the source cannot be recorded after all.
    virtual bool Produce(Batch& batch) = 0;
    /// From any thread.
    virtual SourceCounts Counts() const = 0;
};

}  // namespace receiver
