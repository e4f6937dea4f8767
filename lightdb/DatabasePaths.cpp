#include "lightdb/LDBM.h"

#include <cstdio>

const char* LDBMBigDBPath(BigDBType type)
{
    if (type == BigDBTypeDefault)
        return "/System/Library/HIDPlugins/Vantish.plugin/bzlight.sqlite";
    return "/System/Library/HIDPlugins/Vantish.plugin/bzlight-02.sqlite";
}

std::string LDBMSmallDBPath(int orientation)
{
    char path[256];
    snprintf(path, sizeof path, "%s_%d%s", "/var/mobile/Library/Brenzel/bzrgbc", orientation, ".sqlite");
    return path;
}
