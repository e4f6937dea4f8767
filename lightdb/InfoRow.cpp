#include "lightdb/CNumbers.h"
#include "lightdb/LDBM.h"

#include <cstring>

// Columns are matched by name; "columns", "samples" and unknown names are
// ignored, and so is any NULL. A later row overwrites an earlier one.
int LDBMReadInfoRow(void* context, int columns, char** values, char** names)
{
    auto* info = static_cast<LDBMInfo*>(context);
    for (int i = 0; i < columns; ++i) {
        const char* name = names[i];
        const char* value = values[i];
        if (!name || !value)
            continue;
        if (strcmp(name, "version") == 0)
            info->version = float(ldbm::parseDecimal(value));
        else if (strcmp(name, "sources") == 0)
            info->sources = ldbm::parseInteger(value);
        else if (strcmp(name, "algo") == 0)
            info->algo = ldbm::parseInteger(value);
        else if (strcmp(name, "smallversion") == 0)
            info->smallVersion = float(ldbm::parseDecimal(value));
        else if (strcmp(name, "chipID") == 0)
            info->chipID = uint32_t(ldbm::parseInteger(value));
    }
    return 0;
}
