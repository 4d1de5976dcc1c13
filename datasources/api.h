#pragma once

// Marks what libkrvdatasources exports; everything else in it is hidden.
#define KRV_DATASOURCES_API __attribute__((visibility("default")))
