// Uses the installed library as a host would: one node, one write, one value change.
#include <core/ClsNodeDBInterface.h>
#include <lang/Conversions.h>

#include <iostream>

int main() {
    maroset::ClsNodeDBInterface host;
    double seen = 0;
    auto sub = host.ValueChange.subscribe(
        [&](maroset::VbArray<int32_t>&, int16_t, maroset::VbArray<maroset::Variant>& values) {
            seen = maroset::CDbl(values(1));
        });
    host.nodeDB()->AddNode("Line1", "MEMTAG");
    host.nodeDB()->getNode("Line1")->WriteTag("7", 2.5);
    std::cout << "value " << seen << std::endl;
    return seen == 2.5 ? 0 : 1;
}
