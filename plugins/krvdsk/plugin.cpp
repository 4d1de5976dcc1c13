#include "datasources/interfaces/formatplugin.h"
#include "plugins/krvdsk/krvdskbuilder.h"

KRV_FORMAT_PLUGIN(krv::plugins::krvdsk::KrvdskBuilder)
