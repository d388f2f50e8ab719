^XA
^FX Tagora demo item label: 50 x 30 mm at 203 dpi, 400 x 240 dots.
^FX Each variable is a dollar sign and the variable name in braces inside a field.
^FX The text fields use the TrueType font E:DEJAVU.TTF, which has Hebrew letters.
^FX The font must be downloaded to the printer once before these labels print:
^FX store DejaVuSans.ttf (package fonts-dejavu-core) on the printer as E:DEJAVU.TTF
^FX with the printer's font download tool or its web page.
^FX Values reach the printer in visual order; text written in this file goes as it is.
^CI28
^PW400
^LL240
^LH0,0
^FO10,10^A@N,30,30,E:DEJAVU.TTF^FB380,1,0,R^FD${ItemName}^FS
^FO10,52^A@N,26,26,E:DEJAVU.TTF^FD${ItemKey}^FS
^FO10,52^A@N,26,26,E:DEJAVU.TTF^FB380,1,0,R^FD${Price}^FS
^FO10,96^BY2^BCN,90,Y,N,N^FD${BarCode}^FS
^XZ
