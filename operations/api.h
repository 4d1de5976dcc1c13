#pragma once

// Marks what libkrvoperations exports; everything else in it is hidden.
#define KRV_OPERATIONS_API __attribute__((visibility("default")))
