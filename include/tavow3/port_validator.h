// The requested TCP port that a port setter receives.
#ifndef TAVOW3_PORT_VALIDATOR_H_
#define TAVOW3_PORT_VALIDATOR_H_

#include <tavow3/export.h>

namespace tavow3 {

// A value type carrying one requested TCP port; 0 means no port and is
// refused by every setter. The setter itself decides whether the port may be
// taken.
class TAVOW3_EXPORT PortValidator {
 public:
  explicit PortValidator(unsigned short port) : port_(port) {}

  unsigned short port() const { return port_; }

 private:
  unsigned short port_;
};

}  // namespace tavow3

#endif  // TAVOW3_PORT_VALIDATOR_H_
