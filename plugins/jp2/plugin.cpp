#include "datasources/interfaces/formatplugin.h"
#include "plugins/jp2/jp2builder.h"

KRV_FORMAT_PLUGIN(krv::plugins::jp2::Jp2Builder)
