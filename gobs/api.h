#pragma once

// Marks what libkrvgobs exports; everything else in it is hidden.
#define KRV_GOBS_API __attribute__((visibility("default")))
