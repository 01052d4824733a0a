var vornText = {
  lang: 'de',
  title: 'Speicherbericht',
  csv: 'CSV-Datei',
  noRows: 'Keine Zeilen',
  damaged: 'Die Daten dieses Berichts sind beschädigt. Den Grund nennt das Protokoll des Laufs.',
  missing: 'Die Daten dieses Berichts fehlen. Den Grund nennt das Protokoll des Laufs.',
  unclear: 'Keine Zeilen, oder die Daten dieses Berichts fehlen. CSV-Datei und Protokoll geben Auskunft.',
  unknown: 'Diese Seite kann den Bericht nicht zeigen. Seine Zeilen stehen in der CSV-Datei.',
  firstRows: 'Die ersten {n} Zeilen; die CSV-Datei enthält mehr.',
  bytes: '{n} Byte',
  reports: {
    share_list: 'Freigaben',
    large_file: 'Größte Dateien'
  },
  columns: {
    share: 'Freigabe',
    volume: 'Volume',
    file: 'Datei',
    size: 'Größe'
  }
};
