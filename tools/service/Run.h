#pragma once

#include <string>
#include <vector>

namespace service {

// The service at work, until it is told to stop.
int run(const std::vector<std::wstring>& arguments);
// One order to the service at work; its answer is printed. False when it was refused or nobody is there.
bool tell(const std::vector<std::wstring>& words);
std::wstring ordersHelp();

} // namespace service
