// The two sources of weight data, a file and a copy of a memory block, behind one bounded reader.
// Write mode and the operators are there for callers; the engine itself only uses the reader.
#pragma once

#include <fstream>
#include <sstream>
#include <string>

#include "kernels/matrix.h"
#include "utils/path.h"
#include "weights/bounded_reader.h"

namespace MORVA::UTILS {

enum class SerializeMode : int { read = 0, write = 1 };

// Reads one matrix block: u32 rows, i32 columns, then rows x columns floats, row by row. A matrix
// with one count of 0 has no element bytes, whatever the other count. A block that does not fit
// into the bytes that are left, or has a negative column count, ends the data and leaves `matrix`
// alone.
void readMatrix(BoundedReader& reader, CONTAINERS::Matrix& matrix);

class SerializerFstream {
public:
    // Opens the file in binary mode, for reading or (any mode but `read`) for writing.
    SerializerFstream(SerializeMode mode, Path const& path);

    SerializerFstream& operator>>(CONTAINERS::Matrix& matrix);

    BoundedReader& reader() { return reader_; }
    // The stream behind write mode; closed in read mode.
    std::ofstream& output() { return output_; }
    SerializeMode mode() const { return mode_; }

private:
    SerializeMode mode_;
    std::ofstream output_;
    std::ifstream input_;
    BoundedReader reader_;
};

class SerializerSstream {
public:
    explicit SerializerSstream(std::string bytes);

    SerializerSstream& operator>>(CONTAINERS::Matrix& matrix);

    BoundedReader& reader() { return reader_; }

private:
    std::stringstream stream_;
    BoundedReader reader_;
};

}  // namespace MORVA::UTILS
