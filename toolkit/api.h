#pragma once

// Marks what libkrvtoolkit exports; everything else in it is hidden.
#define KRV_TOOLKIT_API __attribute__((visibility("default")))
