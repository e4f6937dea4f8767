// Building the per-chip database from a registry calibration entry: the
// Matrices record that carries the entry's spectra into the reference scan, the
// generic four-channel spectrum step, and the common end of every build (scan,
// publication, cache write).
//
// A build fills a SpectralDatabase that nobody else can see yet; only when the
// scan has completed it is it published, whole, to the plug-in object.
#pragma once

#include "lightdb/Matrices.h"
#include "lightdb/SpectralDatabase.h"
#include "sysconfig/SysConfigFormat.h"

#include <CoreFoundation/CoreFoundation.h>

#include <memory>
#include <span>

class Calibration;

namespace sysconfig {

// The per-chip format version of configuration-supplied calibration.
constexpr float kSmallDBVersion = 1.1f;

// Points `matrices` at the arrays of `db` for `channels` response rows. False
// when `db` has not been sized for a build of that many channels.
bool prepareMatrices(SpectralDatabase& db, unsigned channels, Matrices& matrices);

// The generic four-channel step: the entry's spectra (and infrared compensation
// from `auxBlob`, when found) into `matrices`, then finishDatabaseBuild. True
// once the reference database has been scanned.
bool buildGenericSpectrum(Calibration& calibration, bool asyncCreate, std::span<const uint8_t> entry, uint8_t revision,
                          CFTypeRef auxBlob, Matrices& matrices, const std::shared_ptr<SpectralDatabase>& db);

// Scans the reference database through `matrices` into `db`, publishes `db`
// (dbReady as it was) and writes its cache, in place or as a queued task.
// True once `db` is complete and published.
bool finishDatabaseBuild(Calibration& calibration, bool asyncCreate, Matrices& matrices,
                         const std::shared_ptr<SpectralDatabase>& db);

// Writes the cache for `db` and sets dbReady when it was written and `db` is
// still the published database. With `asyncCreate` it runs as a task on the
// default-priority global queue (holding the instance and `db`), else in place.
void startCreationTask(Calibration& calibration, bool asyncCreate, SpectralDatabasePtr db);

} // namespace sysconfig
