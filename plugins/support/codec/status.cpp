#include "plugins/support/codec/status.h"

const char* krv::plugins::codec::StatusText(Status oStatus)
{
    switch (oStatus)
    {
    case Status::eDone:
        return "the data are complete";
    case Status::eTruncated:
        return "the data end too early";
    case Status::eCorrupt:
        return "the data are corrupt";
    case Status::eNoMemory:
        return "there is not enough memory";
    }
    return "the data cannot be decoded";
}
