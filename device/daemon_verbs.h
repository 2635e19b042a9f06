// The commands of `device` that change what the simulated daemon does. They return the exit status,
// 2 for a usage error.
#pragma once

namespace device {

// `device answer`: lists, records or removes answers.
int ManageAnswers(int argc, char** argv);

// `device fault`: lists the faults or sets one.
int ManageFaults(int argc, char** argv);

}  // namespace device
