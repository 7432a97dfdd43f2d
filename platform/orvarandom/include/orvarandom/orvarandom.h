/// \file
/// Stand-in for the appliance's random-number library on Linux systems that lack it.
#ifndef ORVARANDOM_ORVARANDOM_H
#define ORVARANDOM_ORVARANDOM_H

namespace ORVA::RANDOM {

/// A source of random numbers.
class ORVARandomBase {
  public:
    virtual ~ORVARandomBase() = default;

    /// A random number between two bounds, both included, each equally likely.
    /// \return the number; `min` when `max` is not above it
    virtual unsigned int urandom(unsigned int min, unsigned int max) = 0;
};

/// The kernel's random numbers. It keeps no state: a process and its forked child draw different
/// numbers, and any thread may use any object.
class ORVARandom : public ORVARandomBase {
  public:
    unsigned int urandom(unsigned int min, unsigned int max) override;
};

}  // namespace ORVA::RANDOM

#endif
