import { TextInput } from '@patternfly/react-core/dist/esm/components/TextInput';
import SearchIcon from '@patternfly/react-icons/dist/esm/icons/search-icon';
import type { KeyboardEvent } from 'react';
import { t } from '../../texts';

interface SearchFieldProps {
  value: string;
  onChange: (value: string) => void;
  // Turns the page by so many: the field's Page Up and Page Down.
  onTurn: (pages: number) => void;
  label: string;
  // Id of what is searched.
  controls: string;
  // Why the search can't be made.
  problem?: string | undefined;
}

// The search of a list. Escape empties it; the page keys turn the pages without leaving it.
export function SearchField({ value, onChange, onTurn, label, controls, problem }: SearchFieldProps) {
  const onKeyDown = (event: KeyboardEvent) => {
    const pages = event.key === 'PageDown' ? 1 : event.key === 'PageUp' ? -1 : 0;
    if (pages !== 0) {
      event.preventDefault();
      onTurn(pages);
    } else if (event.key === 'Escape' && value !== '') {
      event.preventDefault();
      onChange('');
    }
  };
  return (
    <div className="vorn-search" role="search">
      <TextInput
        type="search"
        value={value}
        onChange={(_event, text) => onChange(text)}
        onKeyDown={onKeyDown}
        aria-label={label}
        aria-controls={controls}
        aria-describedby={`${controls}-keys`}
        placeholder={label}
        customIcon={<SearchIcon />}
        validated={problem === undefined ? 'default' : 'error'}
        autoComplete="off"
        spellCheck="false"
      />
      <p
        id={`${controls}-keys`}
        className={problem === undefined ? 'pf-v6-screen-reader' : 'vorn-problem'}
        role="status"
      >
        {problem ?? t('list.keys')}
      </p>
    </div>
  );
}
