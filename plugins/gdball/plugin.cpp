#include "datasources/interfaces/formatplugin.h"
#include "plugins/gdball/gdballbuilder.h"

KRV_FORMAT_PLUGIN(krv::plugins::gdball::GdballBuilder)
