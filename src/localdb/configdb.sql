-- The supplied configuration database (tagora.tdb): the document types a user
-- can import, the recipe that names each type's ERP tables and columns, the
-- ERP account tables, the import position of each type and the currencies.
-- The build turns this script into the file; a data folder without one gets a copy.
-- Column types follow the local databases' conventions; keys are named PrimaryKey.

BEGIN;

-- ERP account tables that documents point to. 3 stands for "no account".
CREATE TABLE tCSTable (
  CSTableID SMALLINT NOT NULL,
  CSTableName TEXT(30),
  fldCSID TEXT(30),
  fldCSKey TEXT(30),
  fldCSDesc TEXT(30),
  fldMerakezID TEXT(30),
  CONSTRAINT PrimaryKey PRIMARY KEY (CSTableID)
);
INSERT INTO tCSTable VALUES (1, 'CUSTOMERS', 'CUST', 'CUSTNAME', 'CUSTDES', 'MCUST');
INSERT INTO tCSTable VALUES (2, 'SUPPLIERS', 'SUP', 'SUPNAME', 'SUPDES', NULL);
INSERT INTO tCSTable VALUES (3, '', '', '', '', NULL);

-- One import recipe per ERP header/line table pair. Recipes 2, 3 and 4 also
-- have package counts in the extension tables ORDERITEMSA, PORDERITEMSA and
-- TRANSORDER; NoDraft is the condition on the header that leaves drafts out.
CREATE TABLE tWizFiles (
  WizFileID SMALLINT NOT NULL,
  WizFileDesc TEXT(50),
  HeadTable TEXT(30),
  LineTable TEXT(30),
  fldID TEXT(30),
  fldRef1 TEXT(30),
  fldRef2 TEXT(30),
  fldDate TEXT(30),
  fldLineID TEXT(30),
  fldDocCSID TEXT(30),
  NoDraft TEXT(100),
  CONSTRAINT PrimaryKey PRIMARY KEY (WizFileID)
);
INSERT INTO tWizFiles VALUES (1, 'תעודות מלאי ללקוח', 'DOCUMENTS', 'TRANSORDER', 'DOC', 'DOCNO', 'BOOKNUM', 'CURDATE', 'TRANS', 'CUST', 'FINAL = ''Y''');
INSERT INTO tWizFiles VALUES (2, 'הזמנות לקוח', 'ORDERS', 'ORDERITEMS', 'ORD', 'ORDNAME', 'REFERENCE', 'CURDATE', 'ORDI', 'CUST', NULL);
INSERT INTO tWizFiles VALUES (3, 'הזמנות רכש', 'PORDERS', 'PORDERITEMS', 'ORD', 'ORDNAME', 'REFERENCE', 'CURDATE', 'ORDI', 'SUP', NULL);
INSERT INTO tWizFiles VALUES (4, 'חשבוניות לקוח', 'INVOICES', 'INVOICEITEMS', 'IV', 'IVNUM', 'REFERENCE', 'IVDATE', 'KLINE', 'CUST', 'FINAL = ''Y''');
INSERT INTO tWizFiles VALUES (5, 'תעודות מלאי מספק', 'DOCUMENTS', 'TRANSORDER', 'DOC', 'DOCNO', 'BOOKNUM', 'CURDATE', 'TRANS', 'SUP', 'FINAL = ''Y''');

-- The document types offered for import. vTYPE is the header's TYPE code.
CREATE TABLE tDocTypes (
  DocType SMALLINT NOT NULL,
  DocDesc TEXT(50),
  WizFileID SMALLINT,
  vTYPE TEXT(5),
  Include BOOLEAN,
  IncludeDraft BOOLEAN,
  CSTableID SMALLINT,
  CONSTRAINT PrimaryKey PRIMARY KEY (DocType)
);
INSERT INTO tDocTypes VALUES (1, 'הזמנות לקוח', 2, NULL, TRUE, FALSE, 1);
INSERT INTO tDocTypes VALUES (2, 'הזמנות רכש', 3, NULL, FALSE, FALSE, 2);
INSERT INTO tDocTypes VALUES (3, 'תעודות משלוח', 1, 'D', TRUE, FALSE, 1);
INSERT INTO tDocTypes VALUES (4, 'קבלות סחורה', 5, 'P', FALSE, FALSE, 2);
INSERT INTO tDocTypes VALUES (5, 'חשבוניות מס', 4, 'A', FALSE, FALSE, 1);
INSERT INTO tDocTypes VALUES (6, 'העברות בין מחסנים', 1, 'T', FALSE, FALSE, 3);

-- Where the next import of each document type starts (keyed by DocType).
CREATE TABLE tWizFileRanges (
  WizFileID SMALLINT NOT NULL,
  FromIndx INTEGER,
  LastIndx INTEGER,
  CONSTRAINT PrimaryKey PRIMARY KEY (WizFileID)
);
INSERT INTO tWizFileRanges SELECT DocType, 0, 0 FROM tDocTypes;

-- Coin is the ERP's currency code, a key that ignores case like every key here.
CREATE TABLE tCurrencies (
  Coin TEXT(5) NOT NULL COLLATE NOCASE,
  CoinDesc TEXT(50),
  CoinSign TEXT(5),
  CONSTRAINT PrimaryKey PRIMARY KEY (Coin)
);
INSERT INTO tCurrencies VALUES ('ש"ח', 'שקל חדש', '₪');
INSERT INTO tCurrencies VALUES ('$', 'דולר ארה"ב', '$');
INSERT INTO tCurrencies VALUES ('EUR', 'אירו', '€');

-- Stored queries, kept the way every local database keeps them (the catalog
-- the database layer reads when it opens a file).
CREATE TABLE tgrObjects (
  Name TEXT NOT NULL COLLATE NOCASE,
  Kind TEXT NOT NULL,
  Source TEXT,
  SqlText TEXT,
  Seq INTEGER NOT NULL,
  CONSTRAINT PrimaryKey PRIMARY KEY (Name)
);
INSERT INTO tgrObjects (Name, Kind, SqlText, Seq) VALUES ('qSelectDocTypes', 'select',
  'SELECT DocDesc, Include, IncludeDraft, DocType FROM tDocTypes ORDER BY DocType', 1);
INSERT INTO tgrObjects (Name, Kind, SqlText, Seq) VALUES ('qWizFileRanges', 'select',
  'SELECT tDocTypes.DocDesc, tWizFileRanges.LastIndx, tWizFileRanges.FromIndx, tWizFileRanges.WizFileID'
  || ' FROM tWizFileRanges INNER JOIN tDocTypes ON tDocTypes.DocType = tWizFileRanges.WizFileID'
  || ' ORDER BY tWizFileRanges.WizFileID', 2);

COMMIT;
