// What the scripted radio builder of ScriptedRadio.cpp saw: it always fails.
#pragma once

namespace harmona::test {

// How often the radio builder was called.
int& RadioBuilderCalls();

}  // namespace harmona::test
