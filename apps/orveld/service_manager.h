// What a service manager is told through NOTIFY_SOCKET, where it asks to be.
#ifndef ORVEL_ORVELD_SERVICE_MANAGER_H
#define ORVEL_ORVELD_SERVICE_MANAGER_H

#include <string>

namespace orvel::orveld {

// Lines "NAME=value", for example "READY=1". Nothing happens without a service manager.
void notifyManager(const std::string& lines);
// That the settings are being read again; "READY=1" follows when they are.
void notifyReloading();

}  // namespace orvel::orveld

#endif
