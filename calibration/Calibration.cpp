#include "calibration/Calibration.h"

Calibration::Calibration(CalibrationHost& host, UnitConfiguration& unit, FitParameters& fit, DatabaseSlot& databases)
    : host_(host), unit_(unit), fit_(fit), databases_(databases)
{
}

Calibration::Guard::Guard(Calibration& calibration) : calibration_(calibration)
{
    calibration_.mutex_.lock();
    if (calibration_.depth_++ == 0)
        calibration_.owner_ = std::this_thread::get_id();
}

Calibration::Guard::~Guard()
{
    if (--calibration_.depth_ == 0)
        calibration_.owner_ = std::thread::id();
    calibration_.mutex_.unlock();
}
