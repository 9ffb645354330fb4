// The tour: a short walk through the library for a person to watch, one section a family.
#pragma once

#include "jnihost.h"

void tourDesktop(jnihost::Vm& vm, jnihost::Library& lib);
void tourVelzip(jnihost::Vm& vm, jnihost::Library& lib);
void tourChoosers(jnihost::Vm& vm, jnihost::Library& lib);
void tourRegistry(jnihost::Vm& vm, jnihost::Library& lib);
