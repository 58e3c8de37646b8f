#include <lumicor/ktsimilarity.h>

#include "ktlib/src/distance/transport.h"

extern "C" int matrix_emd(_matrix_s* m1, _matrix_s* m2) {
    if (!m1 || !m2 || !m1->data || !m2->data || m1->rows != 1 || m2->rows != 1 || m1->cols <= 0 ||
        m1->cols != m2->cols) {
        return -1;
    }
    int32_t cost = 0;
    if (transport::EmdCost(m1->data, m2->data, m1->cols, &cost) != transport::kOk) return -1;
    return cost;
}
