// A scripted radio builder, linked only into tree_fault_tests in place of the real one (which lives
// in a source unit of its own): the real builder always succeeds, so its failure is made here.
#include "tests/tree/ScriptedRadio.h"

#include "src/handler/HarmonaHandler.h"

namespace harmona::test {

int& RadioBuilderCalls() {
    static int calls = 0;
    return calls;
}

}  // namespace harmona::test

int HarmonaHandler::AddRadioChildren(Json::Value&) {
    ++harmona::test::RadioBuilderCalls();
    return 0;
}
