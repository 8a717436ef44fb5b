// Whom the kernel ends when memory is out: a child, which loses one request, and not the parent, which loses all.
#ifndef ORVEL_ORVELD_OOM_H
#define ORVEL_ORVELD_OOM_H

namespace orvel::orveld {

// In the parent. Only root may; without it everything stays as it is.
void enterProtection();
// In a child.
void leaveProtection();

}  // namespace orvel::orveld

#endif
