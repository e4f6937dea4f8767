#include "lightdb/DatabaseSlot.h"

#include "support/Assert.h"

void DatabaseSlot::publish(SpectralDatabasePtr db, bool ready)
{
    // Calibration publishes only databases it has built whole.
    VANTISH_ASSERT(!db || db->consistent());
    SpectralDatabasePtr previous;
    {
        std::lock_guard lock(mutex_);
        previous = std::move(database_);
        database_ = std::move(db);
        ready_ = ready;
    }
    // `previous` is released here, outside the lock; readers that still hold it keep it alive.
}

void DatabaseSlot::setReady(bool ready)
{
    std::lock_guard lock(mutex_);
    ready_ = ready;
}

DatabaseSlot::Snapshot DatabaseSlot::snapshot() const
{
    std::lock_guard lock(mutex_);
    return {database_, ready_ && database_ != nullptr};
}

bool DatabaseSlot::isReady() const
{
    std::lock_guard lock(mutex_);
    return ready_;
}

void DatabaseSlot::clear()
{
    SpectralDatabasePtr previous;
    std::lock_guard lock(mutex_);
    previous = std::move(database_);
}
