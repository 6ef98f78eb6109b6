// Forward and backward loop of a gated recurrent layer (as torch.nn.GRU has it) over many short
// rows at once.
//
// As many rows as two vectors have lanes travel together, from their first step to their last;
// weights are broadcast. The backward loop computes the gates again instead of having kept them.
// Rows and steps are wherever their strides say, so that the same tensor serves recurrence over
// time and over bands.
#include <algorithm>
#include <cstdint>
#include <cstring>
#include <vector>

namespace {

#if defined(__AVX512F__)
constexpr int LANES = 16;
#elif defined(__AVX__)
constexpr int LANES = 8;
#else
constexpr int LANES = 4;
#endif
constexpr int ROWS = 2 * LANES, OUTS = 8, TILE = 4, CHUNK = 8;

using Vector = float __attribute__((vector_size(4 * LANES)));
using Whole = std::int32_t __attribute__((vector_size(4 * LANES)));

/// One value of every row that travels together.
struct Pair {
    Vector low, high;
};

using Pairs = std::vector<Pair>;

Vector clamped(Vector x, float low, float high) {
    x = x < low ? Vector{} + low : x;
    return x > high ? Vector{} + high : x;
}

Vector exponential(Vector x) {
    const Vector scaled = clamped(x, -80.0F, 80.0F) * 1.44269504F;
    const Whole whole = __builtin_convertvector(
        scaled + (scaled < 0.0F ? Vector{} - 0.5F : Vector{} + 0.5F), Whole);
    const Vector t = (scaled - __builtin_convertvector(whole, Vector)) * 0.69314718F;
    Vector sum = Vector{} + 1.0F / 720.0F;
    for (const float factor : {1.0F / 120.0F, 1.0F / 24.0F, 1.0F / 6.0F, 0.5F, 1.0F, 1.0F}) {
        sum = sum * t + factor;
    }
    const Whole bits = (whole + 127) << 23;
    Vector power;
    std::memcpy(&power, &bits, sizeof power);
    return sum * power;
}

Vector sigmoid(Vector x) {
    return 1.0F / (1.0F + exponential(-x));
}

Vector tangent(Vector x) {
    return 2.0F * sigmoid(2.0F * x) - 1.0F;
}

/// A matrix [outs][ins] in the order in which `product` reads it.
class Packed {
public:
    Packed(const float* matrix, int outs, int ins, int outStep, int inStep)
        : outs_(outs),
          ins_(ins),
          values_(static_cast<std::size_t>((outs + OUTS - 1) / OUTS * OUTS) * ins) {
        for (int out = 0; out < outs; out++) {
            for (int in = 0; in < ins; in++) {
                values_[(out / OUTS * ins + in) * OUTS + out % OUTS] =
                    matrix[out * outStep + in * inStep];
            }
        }
    }

    /// sums[out] += matrix * x; `sums` has room for whole tiles.
    void product(const Pair* x, Pair* sums) const {
        const float* weights = values_.data();
        for (int out = 0; out < outs_; out += OUTS) {
            Vector low[OUTS], high[OUTS];
#pragma GCC unroll 8
            for (int i = 0; i < OUTS; i++) {
                low[i] = sums[out + i].low;
                high[i] = sums[out + i].high;
            }
            for (int in = 0; in < ins_; in++, weights += OUTS) {
                const Vector left = x[in].low, right = x[in].high;
#pragma GCC unroll 8
                for (int i = 0; i < OUTS; i++) {
                    low[i] += weights[i] * left;
                    high[i] += weights[i] * right;
                }
            }
#pragma GCC unroll 8
            for (int i = 0; i < OUTS; i++) {
                sums[out + i] = {low[i], high[i]};
            }
        }
    }

private:
    int outs_, ins_;
    std::vector<float> values_;
};

/// Sums over rows and steps of the products of two sides, for the gradient of a matrix.
class Outer {
public:
    Outer(int outs, int ins)
        : outs_(outs), ins_(ins), sums_(static_cast<std::size_t>(padded(outs)) * padded(ins)) {}

    int outs() const { return outs_; }

    static int padded(int count) { return (count + OUTS - 1) / OUTS * OUTS; }

    /// Adds `steps` steps of a [steps][padded outs] and b [steps][padded ins].
    void add(const Pair* a, const Pair* b, int steps) {
        const int outs = padded(outs_), ins = padded(ins_);
        Vector* sums = sums_.data();
        for (int out = 0; out < outs; out += TILE) {
            for (int in = 0; in < ins; in += TILE, sums += TILE * TILE) {
                Vector tile[TILE * TILE];
                std::copy_n(sums, TILE * TILE, tile);
                for (int step = 0; step < steps; step++) {
                    multiply(a + step * outs + out, b + step * ins + in, tile);
                }
                std::copy_n(tile, TILE * TILE, sums);
            }
        }
    }

    void store(float* matrix) const {
        for (int out = 0; out < outs_; out++) {
            for (int in = 0; in < ins_; in++) {
                const int tile = out / TILE * (padded(ins_) / TILE) + in / TILE;
                const Vector sum = sums_[(tile * TILE + out % TILE) * TILE + in % TILE];
                for (int lane = 0; lane < LANES; lane++) {
                    matrix[out * ins_ + in] += sum[lane];
                }
            }
        }
    }

private:
    static void multiply(const Pair* a, const Pair* b, Vector* tile) {
#pragma GCC unroll 4
        for (int i = 0; i < TILE; i++) {
#pragma GCC unroll 4
            for (int j = 0; j < TILE; j++) {
                tile[i * TILE + j] += a[i].low * b[j].low + a[i].high * b[j].high;
            }
        }
    }

    int outs_, ins_;
    std::vector<Vector> sums_;
};

/// One step in which blocks of `apart` rows and columns change places, of LANES vectors.
template <int apart>
void swapBlocks(Vector* rows) {
    Whole upper, lower;
    for (int lane = 0; lane < LANES; lane++) {
        const bool right = (lane & apart) != 0;
        upper[lane] = right ? LANES + lane - apart : lane;
        lower[lane] = right ? LANES + lane : lane + apart;
    }
    for (int row = 0; row < LANES; row++) {
        if ((row & apart) == 0) {
            const Vector above = rows[row], below = rows[row + apart];
            rows[row] = __builtin_shuffle(above, below, upper);
            rows[row + apart] = __builtin_shuffle(above, below, lower);
        }
    }
    if constexpr (apart > 1) {
        swapBlocks<apart / 2>(rows);
    }
}

/// LANES values of each of as many rows, `stride` apart: rows and columns change places.
void transposed(const float* source, long stride, Vector* block) {
    for (int row = 0; row < LANES; row++) {
        std::memcpy(block + row, source + row * stride, sizeof(Vector));
    }
    swapBlocks<LANES / 2>(block);
}

/// `count` values of each of `rows` rows, `stride` apart, side by side.
void gather(const float* source, long stride, int rows, int count, Pair* to) {
    int first = 0;
    for (; rows == ROWS && first + LANES <= count; first += LANES) {
        Vector low[LANES], high[LANES];
        transposed(source + first, stride, low);
        transposed(source + LANES * stride + first, stride, high);
        for (int i = 0; i < LANES; i++) {
            to[first + i] = {low[i], high[i]};
        }
    }
    for (int i = first; i < count; i++) {
        alignas(Pair) float lanes[ROWS] = {};
        for (int row = 0; row < rows; row++) {
            lanes[row] = source[row * stride + i];
        }
        std::memcpy(to + i, lanes, sizeof lanes);
    }
}

template <bool Add>
void store(Vector value, float* target) {
    if constexpr (Add) {
        Vector before;
        std::memcpy(&before, target, sizeof before);
        value += before;
    }
    std::memcpy(target, &value, sizeof value);
}

template <bool Add>
void scatter(const Pair* from, long stride, int rows, int count, float* target) {
    int first = 0;
    for (; rows == ROWS && first + LANES <= count; first += LANES) {
        Vector low[LANES], high[LANES];
        for (int i = 0; i < LANES; i++) {
            low[i] = from[first + i].low;
            high[i] = from[first + i].high;
        }
        swapBlocks<LANES / 2>(low);
        swapBlocks<LANES / 2>(high);
        for (int row = 0; row < LANES; row++) {
            store<Add>(low[row], target + row * stride + first);
            store<Add>(high[row], target + (LANES + row) * stride + first);
        }
    }
    for (int i = first; i < count; i++) {
        alignas(Pair) float lanes[ROWS];
        std::memcpy(lanes, from + i, sizeof lanes);
        for (int row = 0; row < rows; row++) {
            target[row * stride + i] = Add ? target[row * stride + i] + lanes[row] : lanes[row];
        }
    }
}

}  // namespace

extern "C" {

/// What the layer is and where its rows are; the same as in recurrence.py.
struct Layer {
    const float *x, *state;  // [rows][hidden] before the first step
    const float *inWeights, *stateWeights, *inBias, *stateBias;  // reset, update, new
    float* y;
    std::int64_t steps, rows, ins, hidden;
    std::int64_t xStep, xRow, yStep, yRow;
    std::int64_t backwards;
};

struct Gradients {
    const float* y;
    float *x, *inWeights, *stateWeights, *inBias,
        *stateBias;  // added to x; the others set; x like the layer's, y like its y
};
}

namespace {

/// Gates of rows that travel together, at one step.
class Gates {
public:
    explicit Gates(const Layer& layer)
        : layer_(layer),
          hidden_(static_cast<int>(layer.hidden)),
          ofInput_(layer.inWeights, 3 * hidden_, static_cast<int>(layer.ins),
                   static_cast<int>(layer.ins), 1),
          ofState_(layer.stateWeights, 3 * hidden_, hidden_, hidden_, 1),
          fromInput(Outer::padded(3 * hidden_)),
          fromState(Outer::padded(3 * hidden_)),
          reset(hidden_),
          update(hidden_),
          fresh(hidden_) {}

    void compute(const Pair* x, const Pair* h) {
        for (int i = 0; i < 3 * hidden_; i++) {
            fromInput[i] = {Vector{} + layer_.inBias[i], Vector{} + layer_.inBias[i]};
            fromState[i] = {Vector{} + layer_.stateBias[i], Vector{} + layer_.stateBias[i]};
        }
        ofInput_.product(x, fromInput.data());
        ofState_.product(h, fromState.data());
        for (int i = 0; i < hidden_; i++) {
            const auto each = [&](Vector Pair::*half) {
                reset[i].*half = sigmoid(fromInput[i].*half + fromState[i].*half);
                update[i].*half =
                    sigmoid(fromInput[hidden_ + i].*half + fromState[hidden_ + i].*half);
                fresh[i].*half = tangent(fromInput[2 * hidden_ + i].*half +
                                         reset[i].*half * fromState[2 * hidden_ + i].*half);
            };
            each(&Pair::low);
            each(&Pair::high);
        }
    }

private:
    const Layer& layer_;
    int hidden_;
    Packed ofInput_, ofState_;

public:
    Pairs fromInput, fromState, reset, update, fresh;
};

long stepAt(const Layer& layer, long index) {
    return layer.backwards ? layer.steps - 1 - index : index;
}

/// What the state was before the step.
void stateBefore(const Layer& layer, long index, long row, int rows, Pair* h) {
    const auto hidden = static_cast<int>(layer.hidden);
    if (index == 0) {
        gather(layer.state + row * hidden, hidden, rows, hidden, h);
    } else {
        gather(layer.y + stepAt(layer, index - 1) * layer.yStep + row * layer.yRow, layer.yRow,
               rows, hidden, h);
    }
}

void forwardRows(const Layer& layer, Gates& gates, long row, int rows) {
    const auto hidden = static_cast<int>(layer.hidden), ins = static_cast<int>(layer.ins);
    Pairs x(ins), h(hidden);
    stateBefore(layer, 0, row, rows, h.data());
    for (long index = 0; index < layer.steps; index++) {
        const long step = stepAt(layer, index);
        gather(layer.x + step * layer.xStep + row * layer.xRow, layer.xRow, rows, ins, x.data());
        gates.compute(x.data(), h.data());
        for (int i = 0; i < hidden; i++) {
            h[i].low = gates.fresh[i].low + gates.update[i].low * (h[i].low - gates.fresh[i].low);
            h[i].high =
                gates.fresh[i].high + gates.update[i].high * (h[i].high - gates.fresh[i].high);
        }
        scatter<false>(h.data(), layer.yRow, rows, hidden,
                       layer.y + step * layer.yStep + row * layer.yRow);
    }
}

class Backward {
public:
    Backward(const Layer& layer, const Gradients& gradients)
        : layer_(layer),
          gradients_(gradients),
          hidden_(static_cast<int>(layer.hidden)),
          ins_(static_cast<int>(layer.ins)),
          gates_(layer),
          toInput_(layer.inWeights, ins_, 3 * hidden_, 1, ins_),
          toState_(layer.stateWeights, hidden_, 3 * hidden_, 1, hidden_),
          inOuter_(3 * hidden_, ins_ + 1),
          stateOuter_(3 * hidden_, hidden_ + 1),
          xs_(CHUNK * static_cast<std::size_t>(Outer::padded(ins_ + 1))),
          hs_(CHUNK * static_cast<std::size_t>(Outer::padded(hidden_ + 1))),
          inSide_(CHUNK * static_cast<std::size_t>(Outer::padded(3 * hidden_))),
          stateSide_(inSide_.size()),
          dx_(Outer::padded(ins_)),
          dh_(Outer::padded(hidden_)),
          dy_(hidden_) {
        const Pair one = {Vector{} + 1.0F, Vector{} + 1.0F};  // the input of the biases
        for (int step = 0; step < CHUNK; step++) {
            xs_[step * Outer::padded(ins_ + 1) + ins_] = one;
            hs_[step * Outer::padded(hidden_ + 1) + hidden_] = one;
        }
    }

    void rows(long row, int rows) {
        std::fill(dh_.begin(), dh_.end(), Pair{});
        for (long last = layer_.steps; last > 0; last -= CHUNK) {
            const int count = static_cast<int>(std::min<long>(CHUNK, last));
            for (int i = 0; i < count; i++) {
                step(last - 1 - i, i, row, rows);
            }
            inOuter_.add(inSide_.data(), xs_.data(), count);
            stateOuter_.add(stateSide_.data(), hs_.data(), count);
        }
    }

    void store() const {
        store(inOuter_, ins_, gradients_.inWeights, gradients_.inBias);
        store(stateOuter_, hidden_, gradients_.stateWeights, gradients_.stateBias);
    }

private:
    void step(long index, int slot, long row, int rows) {
        const long step = stepAt(layer_, index);
        Pair *x = &xs_[slot * Outer::padded(ins_ + 1)],
             *h = &hs_[slot * Outer::padded(hidden_ + 1)];
        Pair *in = &inSide_[slot * Outer::padded(3 * hidden_)],
             *state = &stateSide_[slot * Outer::padded(3 * hidden_)];
        gather(layer_.x + step * layer_.xStep + row * layer_.xRow, layer_.xRow, rows, ins_, x);
        stateBefore(layer_, index, row, rows, h);
        gather(gradients_.y + step * layer_.yStep + row * layer_.yRow, layer_.yRow, rows, hidden_,
               dy_.data());
        gates_.compute(x, h);
        for (int i = 0; i < hidden_; i++) {
            half(i, &Pair::low, h, in, state);
            half(i, &Pair::high, h, in, state);
        }
        std::fill(dx_.begin(), dx_.end(), Pair{});
        toInput_.product(in, dx_.data());
        toState_.product(state, dh_.data());
        scatter<true>(dx_.data(), layer_.xRow, rows, ins_,
                      gradients_.x + step * layer_.xStep + row * layer_.xRow);
    }

    void half(int i, Vector Pair::*half, const Pair* h, Pair* in, Pair* state) {
        const Vector reset = gates_.reset[i].*half, update = gates_.update[i].*half,
                     fresh = gates_.fresh[i].*half;
        const Vector after = dy_[i].*half + dh_[i].*half;
        const Vector dFresh = after * (1.0F - update) * (1.0F - fresh * fresh);
        const Vector dReset =
            dFresh * gates_.fromState[2 * hidden_ + i].*half * reset * (1.0F - reset);
        const Vector dUpdate = after * (h[i].*half - fresh) * update * (1.0F - update);
        in[i].*half = state[i].*half = dReset;
        in[hidden_ + i].*half = state[hidden_ + i].*half = dUpdate;
        in[2 * hidden_ + i].*half = dFresh;
        state[2 * hidden_ + i].*half = dFresh * reset;
        dh_[i].*half = after * update;
    }

    static void store(const Outer& outer, int ins, float* weights, float* bias) {
        std::vector<float> both(static_cast<std::size_t>(outer.outs()) * (ins + 1));
        outer.store(both.data());
        for (int out = 0; out < outer.outs(); out++) {
            std::copy_n(&both[out * (ins + 1)], ins, weights + out * ins);
            bias[out] = both[out * (ins + 1) + ins];
        }
    }

    const Layer& layer_;
    const Gradients& gradients_;
    int hidden_, ins_;
    Gates gates_;
    Packed toInput_, toState_;
    Outer inOuter_, stateOuter_;
    Pairs xs_, hs_, inSide_, stateSide_, dx_, dh_, dy_;
};

}  // namespace

extern "C" {

void forward(const Layer* layer) {
    Gates gates(*layer);
    for (long row = 0; row < layer->rows; row += ROWS) {
        forwardRows(*layer, gates, row, static_cast<int>(std::min<long>(ROWS, layer->rows - row)));
    }
}

void backward(const Layer* layer, const Gradients* gradients) {
    Backward backward(*layer, *gradients);
    for (long row = 0; row < layer->rows; row += ROWS) {
        backward.rows(row, static_cast<int>(std::min<long>(ROWS, layer->rows - row)));
    }
    backward.store();
}
}
