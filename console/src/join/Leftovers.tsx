import { Alert } from '@patternfly/react-core/dist/esm/components/Alert';
import { t } from '../texts';

// What a join or leave could not clear away or put back; nothing when there is none.
export function Leftovers({ items }: { items: string[] }) {
  if (items.length === 0) return null;
  return (
    <Alert isInline variant="warning" component="p" title={t('join.leftovers')}>
      <ul className="vorn-leftovers">
        {items.map((item) => (
          <li key={item}>{item}</li>
        ))}
      </ul>
    </Alert>
  );
}
