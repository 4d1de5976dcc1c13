#include "datasources/interfaces/formatplugin.h"
#include "plugins/tif/tifbuilder.h"

KRV_FORMAT_PLUGIN(krv::plugins::tif::TifBuilder)
