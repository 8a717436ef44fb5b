#include "operation/operation.h"
#include "operation/transfer_job.h"

namespace orvel::cgi {

int copyOperation(Operation& operation) {
    return startTransfer(operation, false);
}

}  // namespace orvel::cgi
