// Where the per-chip database is published for the filter. Calibration builds
// a database privately and publishes it whole, together with dbReady; a
// reader takes one snapshot per use and keeps the arrays alive for as long as
// it holds it, so a newer database never changes them under it.
//
// Threads: any thread; publish, setReady and snapshot are atomic with respect
// to each other (one mutex, held only to swap a pointer and a flag).
#pragma once

#include "lightdb/SpectralDatabase.h"

#include <mutex>

class DatabaseSlot {
public:
    struct Snapshot {
        SpectralDatabasePtr db; // null before the first publication
        bool ready = false;     // dbReady at the moment of the snapshot, and a database present
    };

    // Publishes a complete database and the new dbReady in one step.
    void publish(SpectralDatabasePtr db, bool ready);
    // Changes dbReady alone (colour off on fallback, on after a cache write).
    void setReady(bool ready);
    Snapshot snapshot() const;
    bool isReady() const;
    // Lets go of the published database (the instance is going away).
    void clear();

private:
    mutable std::mutex mutex_;
    SpectralDatabasePtr database_; // guarded by mutex_
    bool ready_ = false;           // dbReady; guarded by mutex_
};
