#pragma once

#include <QString>
#include <QtGlobal>
#include <map>
#include <memory>

namespace tagora {

// The barcode settings of the direct label, one record for every barcode
// line. Lengths are in the barcode library's unit 0 (inches, see barcode.cpp).
struct LabelBarDef {
    short BarType = 0;         // position in the designer's symbology list; negative = no pictures
    QString LeftPrefix;        // put before the encoded value
    short LeftLen = 0;         // > 0: only this many characters from the left of the value
    float DimX = 0.01f;        // narrow bar width
    float WideBarRatio = 2.2f; // wide to narrow bar ratio
    float BarHeight = 0.4f;    // bar height, without the human-readable text
    bool C128User = false;
    bool C39Ascii = false;     // full-ASCII Code 39
    short UserResoX = 100;     // display size of the picture on the page, pixels; <= 0 natural
    short UserResoY = 50;
    bool CheckDigit = true;    // the library adds a check digit
    bool ShowDesc = false;     // the encoded text is printed under the bars
};

// The barcode library's calls. Setters report nothing, as the library's own
// did; only the output says whether a picture was made, and why not.
class BarcodeLibrary {
public:
    virtual ~BarcodeLibrary() = default;

    virtual qint32 A1OpenInstance() = 0;
    virtual void A1SetUnit(qint32 handle, int unit) = 0;
    virtual void A1SetBarType(qint32 handle, int code) = 0;
    virtual void A1SetData(qint32 handle, const QString& data) = 0;
    virtual void A1SetDesc(qint32 handle, const QString& desc) = 0;
    virtual void A1SetDimX(qint32 handle, float dimX) = 0;
    virtual void A1SetWideBarRatio(qint32 handle, float ratio) = 0;
    virtual void A1SetBarHeight(qint32 handle, float height) = 0;
    virtual void A1SetHoriAlign(qint32 handle, int align) = 0;
    virtual void A1SetVertAlign(qint32 handle, int align) = 0;
    virtual void A1SetRotation(qint32 handle, int rotation) = 0;
    virtual void A1SetC128User(qint32 handle, bool on) = 0;
    virtual void A1SetC39Ascii(qint32 handle, bool on) = 0;
    virtual void A1SetCheckDigit(qint32 handle, bool on) = 0;
    virtual void A1SetMatchDesc(qint32 handle, bool on) = 0;
    virtual void A1SetMatchFrame(qint32 handle, bool on) = 0;
    virtual void A1SetMultiLine(qint32 handle, bool on) = 0;
    virtual void A1SetShowDesc(qint32 handle, bool on) = 0;
    virtual void A1SetUPCEUser(qint32 handle, bool on) = 0;
    virtual void A1SetUserResoX(qint32 handle, int dpi) = 0;
    virtual void A1SetUserResoY(qint32 handle, int dpi) = 0;
    // Writes the picture as a BMP file at path. On failure no file is left
    // at path (not even one from an earlier job) and error says why.
    virtual bool A1OutputBitmap(qint32 handle, const QString& path, QString* error) = 0;
    // Whether the last output on handle failed for the file, not the value:
    // the picture could not be written whole (a full disk, a folder that
    // refuses it). Another record would fail the same way, so a job stops.
    virtual bool A1OutputUnwritten(qint32 handle) const = 0;
    virtual void A1CloseInstance(qint32 handle) = 0;
    // Whether outputs on different handles may run at the same time, one
    // thread per handle, while handles are opened and closed on one thread.
    virtual bool concurrentHandles() const { return false; }
};

// The library on libzint. Every open handle owns one zint symbol; closing the
// handle, or destroying this object with handles still open, frees it.
class ZintBarcodeLibrary : public BarcodeLibrary {
public:
    ZintBarcodeLibrary();
    ~ZintBarcodeLibrary() override;
    ZintBarcodeLibrary(const ZintBarcodeLibrary&) = delete;
    ZintBarcodeLibrary& operator=(const ZintBarcodeLibrary&) = delete;

    qint32 A1OpenInstance() override;
    void A1SetUnit(qint32 handle, int unit) override;
    void A1SetBarType(qint32 handle, int code) override;
    void A1SetData(qint32 handle, const QString& data) override;
    void A1SetDesc(qint32 handle, const QString& desc) override;
    void A1SetDimX(qint32 handle, float dimX) override;
    void A1SetWideBarRatio(qint32 handle, float ratio) override;
    void A1SetBarHeight(qint32 handle, float height) override;
    void A1SetHoriAlign(qint32 handle, int align) override;
    void A1SetVertAlign(qint32 handle, int align) override;
    void A1SetRotation(qint32 handle, int rotation) override;
    void A1SetC128User(qint32 handle, bool on) override;
    void A1SetC39Ascii(qint32 handle, bool on) override;
    void A1SetCheckDigit(qint32 handle, bool on) override;
    void A1SetMatchDesc(qint32 handle, bool on) override;
    void A1SetMatchFrame(qint32 handle, bool on) override;
    void A1SetMultiLine(qint32 handle, bool on) override;
    void A1SetShowDesc(qint32 handle, bool on) override;
    void A1SetUPCEUser(qint32 handle, bool on) override;
    void A1SetUserResoX(qint32 handle, int dpi) override;
    void A1SetUserResoY(qint32 handle, int dpi) override;
    bool A1OutputBitmap(qint32 handle, const QString& path, QString* error) override;
    bool A1OutputUnwritten(qint32 handle) const override;
    void A1CloseInstance(qint32 handle) override;
    // Each handle owns its symbol and settings, and zint keeps no state
    // between symbols.
    bool concurrentHandles() const override { return true; }

    int openInstances() const { return int(m_instances.size()); }

private:
    struct Instance;
    Instance* find(qint32 handle) const;

    std::map<qint32, std::unique_ptr<Instance>> m_instances;
    qint32 m_nextHandle = 1;
};

// The picture file of one barcode line and record: "B", the field index with
// at least two digits, the record number with at least five, ".BMP".
QString BarcodeImageName(int fieldIndex, int recordNumber);

// The library code for a position in the designer's symbology list. The
// translation starts from the user's position every time: the working copy's
// BarType is never overwritten, so lines sharing the settings agree. The
// full-ASCII Code 39 entry turns on C39Ascii in the working copy.
int libraryBarType(short barType, LabelBarDef& workingCopy);

// One picture through the library, with the fixed settings of a label page.
// unwritten, when given, tells a picture the file could not take from a value
// the symbology refuses.
bool DrawBarcode(const QString& data, const QString& file, const LabelBarDef& bar, int libraryCode,
                 BarcodeLibrary& lib, qint32 handle, QString* error, bool* unwritten = nullptr);

} // namespace tagora
