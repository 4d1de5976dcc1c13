#pragma once

#include <proj.h>

namespace krv::ogc::cs::detail
{

// The functions of PROJ that are called here.
#define KRV_PROJ_FUNCTIONS(X)                                                                                          \
    X(proj_as_projjson)                                                                                                \
    X(proj_as_wkt)                                                                                                     \
    X(proj_clone)                                                                                                      \
    X(proj_context_create)                                                                                             \
    X(proj_context_destroy)                                                                                            \
    X(proj_context_get_database_path)                                                                                  \
    X(proj_context_set_enable_network)                                                                                 \
    X(proj_coordoperation_get_method_info)                                                                             \
    X(proj_coordoperation_get_param)                                                                                   \
    X(proj_coordoperation_get_param_count)                                                                             \
    X(proj_coordoperation_get_towgs84_values)                                                                          \
    X(proj_create)                                                                                                     \
    X(proj_create_crs_to_crs_from_pj)                                                                                  \
    X(proj_create_from_database)                                                                                       \
    X(proj_create_from_wkt)                                                                                            \
    X(proj_crs_get_coordinate_system)                                                                                  \
    X(proj_crs_get_coordoperation)                                                                                     \
    X(proj_crs_get_datum)                                                                                              \
    X(proj_crs_get_datum_ensemble)                                                                                     \
    X(proj_crs_get_geodetic_crs)                                                                                       \
    X(proj_crs_get_sub_crs)                                                                                            \
    X(proj_cs_get_axis_count)                                                                                          \
    X(proj_cs_get_axis_info)                                                                                           \
    X(proj_destroy)                                                                                                    \
    X(proj_ellipsoid_get_parameters)                                                                                   \
    X(proj_get_ellipsoid)                                                                                              \
    X(proj_get_id_auth_name)                                                                                           \
    X(proj_get_id_code)                                                                                                \
    X(proj_get_name)                                                                                                   \
    X(proj_get_source_crs)                                                                                             \
    X(proj_get_type)                                                                                                   \
    X(proj_is_crs)                                                                                                     \
    X(proj_is_equivalent_to_with_ctx)                                                                                  \
    X(proj_log_func)                                                                                                   \
    X(proj_log_level)                                                                                                  \
    X(proj_normalize_for_visualization)                                                                                \
    X(proj_trans_generic)                                                                                              \
    X(proj_uom_get_info_from_database)

// PROJ as it was found at run time. It is loaded when the first reference system is made: with all that it needs it
// takes as long to load as everything else of a program that has no use of one.
struct ProjLibrary
{
#define KRV_PROJ_MEMBER(name) decltype(&::name) name = nullptr;
    KRV_PROJ_FUNCTIONS(KRV_PROJ_MEMBER)
#undef KRV_PROJ_MEMBER
};

// Loads PROJ with the first call; any thread. It stays loaded. Throws krv::LibraryException when it cannot be loaded.
const ProjLibrary& Proj();

} // namespace krv::ogc::cs::detail
