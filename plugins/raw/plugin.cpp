#include "datasources/interfaces/formatplugin.h"
#include "plugins/raw/rawbuilder.h"

KRV_FORMAT_PLUGIN(krv::plugins::raw::RawBuilder)
