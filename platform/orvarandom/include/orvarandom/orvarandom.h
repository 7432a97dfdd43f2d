/// \file
/// Stand-in for the appliance's random-number library on Linux systems that lack it.
#ifndef ORVARANDOM_ORVARANDOM_H
#define ORVARANDOM_ORVARANDOM_H

namespace ORVA::RANDOM {

/// A source of random numbers.
class ORVARandomBase {
  public:
    virtual ~ORVARandomBase() = default;

    /// A random number from `min` to `max`, both included and all equally likely; `min` if `max` is not
    /// above it.
    virtual unsigned int urandom(unsigned int min, unsigned int max) = 0;
};

/// The kernel's random numbers. Has no state: a process and its forked child get different numbers,
/// and any thread may use any object.
class ORVARandom : public ORVARandomBase {
  public:
    unsigned int urandom(unsigned int min, unsigned int max) override;
};

}  // namespace ORVA::RANDOM

#endif
