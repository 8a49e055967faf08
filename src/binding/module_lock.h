// Holds the data-access module's module-data lock for a scope. The unlock runs on
// every path, also after a failed lock, as the module expects.
#ifndef ANNO_BINDING_MODULE_LOCK_H
#define ANNO_BINDING_MODULE_LOCK_H

#include <cstdint>

#include "hosts/modules.h"

class ANModuleDataLock {
 public:
    explicit ANModuleDataLock(DARetrievedDoc retrieved)
        : retrieved_(retrieved), result_(DALockModuleData(retrieved, &slots_)) {}
    ~ANModuleDataLock() { DAUnlockModuleData(retrieved_); }
    ANModuleDataLock(const ANModuleDataLock &) = delete;
    ANModuleDataLock &operator=(const ANModuleDataLock &) = delete;

    bool ok() const { return result_ == 0; }
    uint32_t result() const { return result_; }
    // The module-data slots; null when the lock failed or the module has none.
    void **slots() const { return ok() ? slots_ : nullptr; }

 private:
    DARetrievedDoc retrieved_;
    void **slots_ = nullptr;
    uint32_t result_;
};

#endif  // ANNO_BINDING_MODULE_LOCK_H
