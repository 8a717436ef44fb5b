#include "operation/operation.h"
#include "operation/transfer_job.h"

namespace orvel::cgi {

int moveOperation(Operation& operation) {
    return startTransfer(operation, true);
}

}  // namespace orvel::cgi
