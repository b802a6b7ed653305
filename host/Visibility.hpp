#pragma once

/// Marks a class of the host as one shared identity across modules: driver
/// modules are built with hidden visibility, yet must throw, catch and use
/// the host's classes (and their type information) as the host's own.
#define VXB_API __attribute__((visibility("default")))
