// Symmetric matrices: correlation matrices, cross products and Hessians. Stored as the packed
// lower triangle, so (i, j) and (j, i) are one element.
#pragma once

#include <cstddef>
#include <vector>

namespace MCMath_800 {

class IMCSymMatrix {
public:
    virtual ~IMCSymMatrix() = default;
    //! Resizes to n x n; every element becomes 0.
    virtual void SetNRows(int n) = 0;
    virtual int GetNRows() const = 0;
    //! Sets (i, j) and (j, i). Indices must lie in [0, n).
    virtual void SetElem(int i, int j, double value) = 0;
    virtual double GetElem(int i, int j) const = 0;
    //! Replaces `row` by the n entries of row i; false when i is out of range.
    virtual bool GetRow(int i, std::vector<double>& row) const = 0;
    //! Sets every element to 0, keeping the size.
    virtual void Reset() = 0;
};

class MCSymMatrix : public IMCSymMatrix {
public:
    MCSymMatrix() = default;
    explicit MCSymMatrix(int n) { SetNRows(n); }

    void SetNRows(int n) override;
    int GetNRows() const override { return fN; }
    void SetElem(int i, int j, double value) override { fData[Pos(i, j)] = value; }
    double GetElem(int i, int j) const override { return fData[Pos(i, j)]; }
    bool GetRow(int i, std::vector<double>& row) const override;
    void Reset() override;

    //! Adds `value` to (i, j).
    void AddToElem(int i, int j, double value) { fData[Pos(i, j)] += value; }
    //! Makes this the n x n identity.
    void SetIdentity(int n);
    //! Multiplies every element by `factor`.
    void Scale(double factor);
    //! y = this * x; false when the sizes differ.
    bool Multiply(const std::vector<double>& x, std::vector<double>& y) const;
    bool operator==(const MCSymMatrix& other) const {
        return fN == other.fN && fData == other.fData;
    }

private:
    std::size_t Pos(int i, int j) const {
        const std::size_t a = static_cast<std::size_t>(i > j ? i : j);
        const std::size_t b = static_cast<std::size_t>(i > j ? j : i);
        return a * (a + 1) / 2 + b;
    }

    int fN = 0;                //!< number of rows
    std::vector<double> fData; //!< packed lower triangle, row by row
};

} // namespace MCMath_800
